#include <algorithm>

#include "commands/dvs/dvs.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

VMPortList::VMPortList() {
    Frame::Describe(*this, {"List of active ports for a given VM.",
                            "fetcher",
                            "simple",
                            {{"fields:Port",
                              "Port ID,vSwitch,Portgroup,DVPort ID,MAC Address,IP Address,Team "
                              "Uplink,Uplink Port ID,Active Filters"}}});
}

InputSpecPtr VMPortList::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"world-id", "w", Frame::kInt, "World ID of the VM for listing ports.", Frame::kRequired}});
}

OutputSpecPtr VMPortList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr VMPortList::GetOutputStructure() {
    return Frame::MakeRecord(
        "Port", {Frame::IntField("Port ID"), Frame::StringField("vSwitch"), Frame::StringField("Portgroup"),
                 Frame::StringField("DVPort ID"), Frame::StringField("MAC Address"),
                 Frame::StringField("IP Address"), Frame::StringField("Team Uplink"),
                 Frame::IntField("Uplink Port ID"), Frame::StringListField("Active Filters")});
}

void VMPortList::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, "Unable to list ports for VM: ", [&] {
        // World IDs are 32-bit: a number outside that range names no world (never another one).
        const auto worldId = Dvs::ParseDecimal(input->GetParameter("world-id"));
        auto list = Frame::MakeList(GetOutputStructure());

        TknCtl::Network::VirtualSwitchInfoImpl info;
        for (const auto& portset : info.GetAllSwitches()) {
            if (!portset || !worldId) continue;
            const std::string name = portset->GetName();
            const bool byPortGroup = info.IsLegacySwitch(name) || info.IsOpaqueSwitch(name);
            const auto* dvs =
                byPortGroup ? nullptr : dynamic_cast<const TknCtl::Network::DVSwitchImpl*>(portset.get());
            if (!byPortGroup && !dvs) continue;  // a switch kind without VM ports
            for (const auto& port : portset->GetPorts()) {
                if (!dynamic_cast<const TknCtl::Network::PortImpl*>(port.get())) continue;
                const std::uint32_t client = port->GetClientWorldId();
                if (client == 0 || static_cast<std::int64_t>(client) != *worldId) continue;

                auto record = GetOutputStructure();
                record->SetField("Port ID", port->GetPortId());
                if (byPortGroup) {
                    record->SetField("vSwitch", name);
                    record->SetField("Portgroup", port->GetPortGroupName());
                    record->SetField("DVPort ID", "");
                } else {
                    const std::string dvPortId = port->GetDVPortId();
                    record->SetField("vSwitch", dvs->GetDvsName());
                    record->SetField(
                        "Portgroup",
                        TknCtl::Network::DVPortImpl(dvs->GetUuid(), dvPortId).GetDVPortgroupId());
                    record->SetField("DVPort ID", dvPortId);
                }
                record->SetField("MAC Address", port->GetMacAddress().GetStringAddress());
                record->SetField("IP Address", port->GetIpAddress().GetStringAddress());

                const std::string teamUplink = port->GetTeamUplink();
                if (!teamUplink.empty()) {
                    TknCtl::Network::PnicImpl pnic(teamUplink);
                    record->SetField("Team Uplink", pnic.GetName());
                    // An uplink without a port of its own shows port 0.
                    if (auto uplinkPort = pnic.GetPort())
                        record->SetField("Uplink Port ID", uplinkPort->GetPortId());
                }

                std::vector<std::string> filters;
                for (const auto& filter : port->GetFilterStats()) {
                    if (!filter || !filter->valid) continue;
                    if (std::find(filters.begin(), filters.end(), filter->name) == filters.end()) {
                        filters.push_back(filter->name);
                    }
                }
                record->SetField("Active Filters", filters);
                list->Add(record);
            }
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace
