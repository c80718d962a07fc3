// Dry runs of a session: the calls are recorded as the journal words them, whatever the
// journal's switch, the journal is left alone, and a commit reaches no file.
#include <gtest/gtest.h>
#include <unistd.h>

#include <filesystem>
#include <string>
#include <vector>

#include "core/hook.h"
#include "core/section.h"
#include "hostctl/session.h"
#include "model/journal.h"

namespace {

using HostCtl::Lib::HostSession;
namespace Lib = TknCtl::Lib;

TEST(DryRunSession, RecordsCallsLeavesTheJournalAndCommitsInMemoryOnly) {
    const auto dir = std::filesystem::temp_directory_path() / ("hadro-dryrun-" + std::to_string(getpid()));
    std::filesystem::create_directories(dir);
    const std::string path = (dir / "host.json").string();
    {
        auto session = HostSession::OpenFile(path);
        Lib::Write<TknCtl::Model::JournalSection>().enabled = true;
        EXPECT_FALSE(session->IsDryRun());
        EXPECT_FALSE(Lib::DryRun());
        session->StartDryRun();
        EXPECT_TRUE(Lib::DryRun());
        Lib::Enter("A::B", "vmnic1", Lib::Args("x", 2, true));
        Lib::Enter("C::D");
        // The last line of a dry run that went as far as it could; what comes after is dropped
        // until the lines are taken.
        Lib::RecordDryRun("kernel: link set vmnic1 down");
        Lib::RecordDryRun("dry run ends here: ...", true);
        Lib::Enter("E::F");
        EXPECT_EQ(session->TakeDryRunLines(),
                  (std::vector<std::string>{"A::B vmnic1 x 2 true", "C::D", "kernel: link set vmnic1 down",
                                            "dry run ends here: ..."}));
        Lib::Enter("G::H");
        EXPECT_EQ(session->TakeDryRunLines(), (std::vector<std::string>{"G::H"}));
        EXPECT_TRUE(Lib::Read<TknCtl::Model::JournalSection>().lines.empty());
        session->Commit();  // the file that does not exist yet is not made
    }
    EXPECT_FALSE(std::filesystem::exists(path));
    EXPECT_FALSE(Lib::DryRun());  // a dry run ends with its session
    std::filesystem::remove_all(dir);
}

}  // namespace
