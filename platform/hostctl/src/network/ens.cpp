// ENS contexts.
//
// Rules of the host: a context ID is below the maximum number of contexts; the maximum is at
// most MAX_LCORES_LIMIT and above every ID in use; a context serves at most one switch, a
// standard or distributed switch of the host ("null": none); its affinity is a NUMA node of
// the host. A request the host declines without error returns false: adding a context that
// exists, removing one that does not, associating a context with the switch it already
// serves, disassociating one that serves none. A malformed request throws.
#include "model/ens.h"
#include "backend/host.h"
#include "backend/switches.h"
#include "core/hook.h"
#include "core/section.h"
#include "hostctl/exception.h"
#include "hostctl/network/network_info.h"
#include "model/dvswitches.h"
#include "model/vswitches.h"

namespace HostCtl::Network {

namespace {

using TknCtl::Model::EnsSection;
using TknCtl::Model::Lcore;

const char* const kNoSwitch = "null";

std::string Id(unsigned long id) {
    return std::to_string(id);
}

void Enter(const char* operation, const std::string& args = {}) {
    TknCtl::Lib::Enter(std::string("HostCtl::Network::NetworkInfo::") + operation, {}, args);
    // A real host answers for its ENS contexts (the Linux host has none and refuses).
    if (auto* host = TknCtl::Lib::RealHost()) host->GetSwitches().RequireEns();
}

// An ID the host could hold: below the maximum.
void CheckId(const EnsSection& ens, unsigned long id) {
    if (id >= ens.maxLcores) {
        throw Lib::HostCtlException("ENS context ID " + Id(id) +
                                    " is out of range: IDs are below the maximum " +
                                    std::to_string(ens.maxLcores));
    }
}

// The context of an ID; throws when there is none.
const Lcore& Existing(const EnsSection& ens, unsigned long id) {
    CheckId(ens, id);
    const Lcore* lcore = ens.Find(id);
    if (!lcore) throw Lib::HostCtlException("ENS context " + Id(id) + " does not exist");
    return *lcore;
}

}  // namespace

std::uint64_t NetworkInfo::GetMaxLcores() {
    Enter("GetMaxLcores");
    return TknCtl::Lib::Read<EnsSection>().maxLcores;
}

bool NetworkInfo::SetMaxLcores(unsigned long maxLcores) {
    Enter("SetMaxLcores", TknCtl::Lib::Args(maxLcores));
    const auto& ens = TknCtl::Lib::Read<EnsSection>();
    if (maxLcores > TknCtl::Model::kMaxLcoresLimit) {
        throw Lib::HostCtlException("The maximum number of ENS contexts must be at most " +
                                    std::to_string(TknCtl::Model::kMaxLcoresLimit) + ", not " +
                                    Id(maxLcores));
    }
    for (const auto& lcore : ens.lcores) {
        if (lcore.id >= maxLcores) {
            throw Lib::HostCtlException("The maximum number of ENS contexts cannot be " + Id(maxLcores) +
                                        ": ENS context " + std::to_string(lcore.id) +
                                        " exists; remove it first");
        }
    }
    if (ens.maxLcores != maxLcores) TknCtl::Lib::Write<EnsSection>().maxLcores = maxLcores;
    return true;
}

bool NetworkInfo::AddLcore(unsigned long lcoreId) {
    Enter("AddLcore", TknCtl::Lib::Args(lcoreId));
    const auto& ens = TknCtl::Lib::Read<EnsSection>();
    CheckId(ens, lcoreId);
    if (ens.Find(lcoreId)) return false;
    Lcore lcore;
    lcore.id = lcoreId;
    TknCtl::Lib::Write<EnsSection>().lcores.push_back(lcore);
    return true;
}

bool NetworkInfo::RemoveLcore(unsigned long lcoreId) {
    Enter("RemoveLcore", TknCtl::Lib::Args(lcoreId));
    const auto& ens = TknCtl::Lib::Read<EnsSection>();
    CheckId(ens, lcoreId);
    if (!ens.Find(lcoreId)) return false;
    auto& lcores = TknCtl::Lib::Write<EnsSection>().lcores;
    for (auto it = lcores.begin(); it != lcores.end(); ++it) {
        if (it->id == lcoreId) {
            lcores.erase(it);
            break;
        }
    }
    return true;
}

std::vector<std::uint64_t> NetworkInfo::GetLcoreList() {
    Enter("GetLcoreList");
    std::vector<std::uint64_t> ids;
    for (const auto& lcore : TknCtl::Lib::Read<EnsSection>().lcores)
        ids.push_back(lcore.id);
    return ids;
}

std::string NetworkInfo::GetLcoreSwitch(unsigned long lcoreId) {
    Enter("GetLcoreSwitch", TknCtl::Lib::Args(lcoreId));
    return Existing(TknCtl::Lib::Read<EnsSection>(), lcoreId).switchName;
}

bool NetworkInfo::AddLcoreSwitch(const std::string& switchName, unsigned long lcoreId) {
    Enter("AddLcoreSwitch", TknCtl::Lib::Args(switchName, lcoreId));
    const Lcore& lcore = Existing(TknCtl::Lib::Read<EnsSection>(), lcoreId);
    if (switchName == lcore.switchName) return false;
    if (switchName != kNoSwitch) {
        if (!TknCtl::Lib::Read<TknCtl::Model::VSwitchesSection>().Find(switchName) &&
            !TknCtl::Lib::Read<TknCtl::Model::DvSwitchesSection>().Find(switchName)) {
            throw Lib::HostCtlException("Virtual switch '" + switchName + "' does not exist");
        }
        if (lcore.switchName != kNoSwitch) {
            throw Lib::HostCtlException("ENS context " + Id(lcoreId) + " already serves switch " +
                                        lcore.switchName + "; disassociate it first");
        }
    }
    TknCtl::Lib::Write<EnsSection>().Find(lcoreId)->switchName = switchName;
    return true;
}

std::uint32_t NetworkInfo::GetLcoreAffinity(unsigned long lcoreId) {
    Enter("GetLcoreAffinity", TknCtl::Lib::Args(lcoreId));
    return Existing(TknCtl::Lib::Read<EnsSection>(), lcoreId).affinity;
}

bool NetworkInfo::SetLcoreAffinity(unsigned int numaNode, unsigned long lcoreId) {
    Enter("SetLcoreAffinity", TknCtl::Lib::Args(numaNode, lcoreId));
    const auto& ens = TknCtl::Lib::Read<EnsSection>();
    const Lcore& lcore = Existing(ens, lcoreId);
    if (numaNode >= ens.numaNodes) {
        throw Lib::HostCtlException("NUMA node " + std::to_string(numaNode) +
                                    " does not exist: the host has " + std::to_string(ens.numaNodes) +
                                    " (0 to " + std::to_string(ens.numaNodes - 1) + ")");
    }
    if (lcore.affinity != numaNode) TknCtl::Lib::Write<EnsSection>().Find(lcoreId)->affinity = numaNode;
    return true;
}

}  // namespace HostCtl::Network
