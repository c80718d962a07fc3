// SR-IOV physical functions and their virtual functions.
#include "backend/nics.h"
#include "core/hook.h"
#include "core/section.h"
#include "hostctl/exception.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"
#include "model/pnics.h"

namespace TknCtl::Network {

using HostCtl::Lib::HostCtlException;

namespace {

// The SR-IOV enabled adapter of that name; throws when there is none.
const Model::Pnic& SriovPnic(const std::string& name) {
    const auto& nic = Model::ReadPnic(name);
    if (!nic.sriov.enabled) throw HostCtlException(name + " is not an SR-IOV enabled NIC");
    return nic;
}

}  // namespace

std::vector<std::unique_ptr<HostCtl::Network::Pnic>> NetworkInfoImpl::GetSriovNics() {
    std::vector<std::unique_ptr<HostCtl::Network::Pnic>> nics;
    if (auto* real = Backend::EnterRealNics("TknCtl::Network::NetworkInfoImpl::GetSriovNics")) {
        for (auto& name : real->ListSriovNics())
            nics.push_back(std::make_unique<PnicImpl>(std::move(name)));
        return nics;
    }
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetSriovNics");
    for (const auto& nic : Lib::Read<Model::PnicsSection>().nics) {
        if (nic.sriov.enabled) nics.push_back(std::make_unique<PnicImpl>(nic.name));
    }
    return nics;
}

std::unique_ptr<HostCtl::Network::Pnic> NetworkInfoImpl::GetSriovNicByName(const std::string& name) {
    if (auto* real = Backend::EnterRealNics("TknCtl::Network::NetworkInfoImpl::GetSriovNicByName", name))
        return real->IsSriovNic(name) ? std::make_unique<PnicImpl>(name) : nullptr;
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetSriovNicByName", name);
    const auto* nic = Lib::Read<Model::PnicsSection>().Find(name);
    if (!nic || !nic->sriov.enabled) return nullptr;
    return std::make_unique<PnicImpl>(name);
}

std::vector<HostCtl::Network::SriovNicVFInfo> NetworkInfoImpl::GetSriovNicVFInfo(const std::string& name) {
    if (auto* real = Backend::EnterRealNics("TknCtl::Network::NetworkInfoImpl::GetSriovNicVFInfo", name))
        return real->GetSriovNicVFInfo(name);
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetSriovNicVFInfo", name);
    std::vector<HostCtl::Network::SriovNicVFInfo> vfs;
    for (const auto& vf : SriovPnic(name).sriov.vfs) {
        HostCtl::Network::SriovNicVFInfo info;
        info.vfId = static_cast<std::uint8_t>(vf.id);
        info.active = vf.active;
        info.pciAddress = vf.pciAddress;
        info.ownerWorldId = vf.ownerWorldId != 0 ? std::to_string(vf.ownerWorldId) : std::string();
        vfs.push_back(std::move(info));
    }
    return vfs;
}

void NetworkInfoImpl::GetSriovNicVFStats(HostCtl::Network::SriovNicVFStats* stats, const std::string& name,
                                         std::uint8_t vfId) {
    auto* real = Backend::EnterRealNics("TknCtl::Network::NetworkInfoImpl::GetSriovNicVFStats", name);
    if (!real) Lib::Enter("TknCtl::Network::NetworkInfoImpl::GetSriovNicVFStats", name, Lib::Args(vfId));
    if (!stats) throw HostCtlException("No record given for the statistics of VF " + std::to_string(vfId));
    if (real) return real->GetSriovNicVFStats(name, vfId, *stats);
    const auto& nic = SriovPnic(name);
    for (const auto& vf : nic.sriov.vfs) {
        if (vf.id != vfId) continue;
        const auto& s = vf.stats;
        stats->rxUnicastPkts = s.rxUnicastPkts;
        stats->rxUnicastBytes = s.rxUnicastBytes;
        stats->rxMulticastPkts = s.rxMulticastPkts;
        stats->rxMulticastBytes = s.rxMulticastBytes;
        stats->rxBroadcastPkts = s.rxBroadcastPkts;
        stats->rxBroadcastBytes = s.rxBroadcastBytes;
        stats->rxOutOfBufferDrops = s.rxOutOfBufferDrops;
        stats->rxErrorDrops = s.rxErrorDrops;
        stats->rxLroPkts = s.rxLroPkts;
        stats->rxLroBytes = s.rxLroBytes;
        stats->txUnicastPkts = s.txUnicastPkts;
        stats->txUnicastBytes = s.txUnicastBytes;
        stats->txMulticastPkts = s.txMulticastPkts;
        stats->txMulticastBytes = s.txMulticastBytes;
        stats->txBroadcastPkts = s.txBroadcastPkts;
        stats->txBroadcastBytes = s.txBroadcastBytes;
        stats->txErrors = s.txErrors;
        stats->txDiscards = s.txDiscards;
        stats->txTsoPkts = s.txTsoPkts;
        stats->txTsoBytes = s.txTsoBytes;
        return;
    }
    throw HostCtlException(name + " has no VF " + std::to_string(vfId));
}

}  // namespace TknCtl::Network
