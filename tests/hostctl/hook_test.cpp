// The hook every host-control operation begins with: faults and the journal.
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "core/hook.h"
#include "core/section.h"
#include "hostctl/exception.h"
#include "hostctl/lib/object.h"
#include "hostctl/session.h"
#include "hostctl/util.h"
#include "model/faults.h"
#include "model/journal.h"

using HostCtl::Lib::HostCtlException;
using HostCtl::Lib::HostSession;
using TknCtl::Lib::Enter;
using TknCtl::Lib::Read;
using TknCtl::Lib::TryEnter;
using TknCtl::Lib::Write;
namespace Model = TknCtl::Model;

namespace {

// The message Enter throws, or "" when the call may go on.
std::string Call(const char* operation, const std::string& target = "", const std::string& arguments = "") {
    try {
        Enter(operation, target, arguments);
    } catch (const HostCtlException& e) {
        return e.what();
    }
    return "";
}

std::unique_ptr<HostSession> SessionWithFaults(const std::string& faults) {
    return HostSession::InMemory(R"({"version":1,"faults":)" + faults + "}");
}

}  // namespace

TEST(Hook, NeedsAnOpenSession) {
    EXPECT_EQ(Call("X::Y"), "no host session is open");
    EXPECT_THROW(TknCtl::Util::TknCtl_Exec("true", false, true, false), HostCtlException);
}

TEST(Hook, FaultsMatchByOperation) {
    auto session = SessionWithFaults(R"([{"operation":"TknCtl::Network::DnsConfigImpl::SaveConfig"}])");
    EXPECT_EQ(Call("TknCtl::Network::DnsConfigImpl::SaveConfig", "defaultTcpipStack"),
              "Simulated failure in TknCtl::Network::DnsConfigImpl::SaveConfig");
    EXPECT_EQ(Call("TknCtl::Network::DnsConfigImpl::SaveConfig", "glidex"),
              "Simulated failure in TknCtl::Network::DnsConfigImpl::SaveConfig");  // unlimited, any target
    EXPECT_EQ(Call("TknCtl::Network::DnsConfigImpl::Refresh"), "");
    EXPECT_EQ(Call("TknCtl::Network::DnsConfigImpl::SaveConfigX"), "");
    EXPECT_FALSE(session->HasChanges());  // an unlimited fault is not used up
}

TEST(Hook, FaultsMatchByTarget) {
    auto session = SessionWithFaults(
        R"([{"operation":"HostCtl::Network::Pnic::GetCoalesceParams","target":"vmnic1","message":"no coalescing"}])");
    EXPECT_EQ(Call("HostCtl::Network::Pnic::GetCoalesceParams", "vmnic0"), "");
    EXPECT_EQ(Call("HostCtl::Network::Pnic::GetCoalesceParams", ""), "");
    EXPECT_EQ(Call("HostCtl::Network::Pnic::GetCoalesceParams", "vmnic1"), "no coalescing");
    EXPECT_EQ(Call("HostCtl::Network::Pnic::GetCoalesceParams", "vmnic1"), "no coalescing");
}

TEST(Hook, FaultsAreUsedUpByCountAndTheFirstMatchApplies) {
    auto session = SessionWithFaults(R"([{"operation":"A::B","message":"first","count":2},
                                         {"operation":"A::B","message":"second","count":1},
                                         {"operation":"C::D","count":1}])");
    EXPECT_EQ(Call("A::B"), "first");
    EXPECT_EQ(Call("A::B"), "first");
    EXPECT_EQ(Call("A::B"), "second");
    EXPECT_EQ(Call("A::B"), "");
    ASSERT_EQ(Read<Model::FaultsSection>().faults.size(), 1u);
    EXPECT_EQ(Read<Model::FaultsSection>().faults[0].operation, "C::D");
    EXPECT_TRUE(session->HasChanges());
}

TEST(Hook, OperationsThatReportByResultGetTheFaultBack) {
    auto session = SessionWithFaults(R"([{"operation":"TknCtl::Util::TknCtl_Exec","count":1}])");
    auto fault = TryEnter("TknCtl::Util::TknCtl_Exec");
    ASSERT_TRUE(fault.has_value());
    EXPECT_EQ(*fault, "Simulated failure in TknCtl::Util::TknCtl_Exec");
    EXPECT_FALSE(TryEnter("TknCtl::Util::TknCtl_Exec").has_value());
    Write<Model::FaultsSection>().faults.push_back({"TknCtl::Util::TknCtl_Exec", "", "", 1});
    EXPECT_NE(TknCtl::Util::TknCtl_Exec("/etc/init.d/nfcd restart", false, true, false), 0);
    EXPECT_EQ(TknCtl::Util::TknCtl_Exec("/etc/init.d/nfcd restart", false, true, false), 0);
}

TEST(Hook, JournalRecordsEveryCallInOrderWhenOn) {
    auto session = HostSession::InMemory(R"({"version":1,"faults":[{"operation":"B::Fails"}]})");
    Enter("A::Quiet");  // journal off: nothing recorded
    Write<Model::JournalSection>().enabled = true;
    Enter("A::First", "vmnic0", TknCtl::Lib::Args("speed", 1000, true));
    Enter("A::Second");
    Enter("A::Third", "", "only arguments");
    EXPECT_THROW(Enter("B::Fails", "vSwitch0"), HostCtlException);  // failed calls are recorded too
    TknCtl::Util::TknCtl_Exec("/etc/init.d/nfcd restart", false, true, false);
    EXPECT_EQ(Read<Model::JournalSection>().lines,
              (std::vector<std::string>{"A::First vmnic0 speed 1000 true", "A::Second",
                                        "A::Third only arguments", "B::Fails vSwitch0",
                                        "TknCtl::Util::TknCtl_Exec /etc/init.d/nfcd restart"}));
}

namespace {
class Probe : public TknCtl::Lib::TknCtlObject, public TknCtl::Lib::Refreshable {
public:
    void Refresh() override { ++refreshed; }
    int refreshed = 0;
};
}  // namespace

TEST(ImplementationObjects, NeedAnOpenSessionAndStartStale) {
    EXPECT_THROW(Probe(), HostCtlException);
    auto session = HostSession::InMemoryDefault();
    Probe probe;
    EXPECT_TRUE(probe.IsStale());
    if (probe.IsStale()) probe.Refresh();
    probe.SetStale(false);
    EXPECT_EQ(probe.refreshed, 1);
    EXPECT_FALSE(probe.IsStale());
}
