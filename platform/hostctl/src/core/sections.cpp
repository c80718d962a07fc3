// The sections of the state document, in document order.
#include "core/section.h"
#include "model/connections.h"
#include "model/dns.h"
#include "model/dvswitches.h"
#include "model/ens.h"
#include "model/faults.h"
#include "model/firewall.h"
#include "model/ipsec.h"
#include "model/ipsettings.h"
#include "model/journal.h"
#include "model/multicast.h"
#include "model/neighbors.h"
#include "model/netstacks.h"
#include "model/pnics.h"
#include "model/ports.h"
#include "model/routes.h"
#include "model/tknnics.h"
#include "model/vswitches.h"
#include "model/worlds.h"

namespace TknCtl::Lib {

const std::vector<const SectionKind*>& AllSections() {
    static const std::vector<const SectionKind*> kinds = {
        &Model::PnicsSection::Kind(),      &Model::VSwitchesSection::Kind(),
        &Model::DvSwitchesSection::Kind(), &Model::NetstacksSection::Kind(),
        &Model::TknNicsSection::Kind(),    &Model::IpSettingsSection::Kind(),
        &Model::RoutesSection::Kind(),     &Model::DnsSection::Kind(),
        &Model::NeighborsSection::Kind(),  &Model::ConnectionsSection::Kind(),
        &Model::MulticastSection::Kind(),  &Model::IpsecSection::Kind(),
        &Model::FirewallSection::Kind(),   &Model::EnsSection::Kind(),
        &Model::PortsSection::Kind(),      &Model::WorldsSection::Kind(),
        &Model::FaultsSection::Kind(),     &Model::JournalSection::Kind(),
    };
    static const bool placed = [] {
        for (std::size_t i = 0; i < kinds.size(); ++i)
            kinds[i]->SetPosition(i);
        return true;
    }();
    static_cast<void>(placed);
    return kinds;
}

}  // namespace TknCtl::Lib
