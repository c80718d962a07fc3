#include <algorithm>

#include "commands/dvs/dvs.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

using namespace Zorbel::MetaObj;

VirtualSwitchDVSTalvexList::VirtualSwitchDVSTalvexList() {
    Frame::Describe(*this,
                    {"List the Talvex Pellix Distributed Switch currently configured on the Hadro host.",
                     "fetcher",
                     "simple",
                     {{"header:QBR", "%Name%"},
                      {"table-columns",
                       "Name,QBR ID,Class,Num Ports,Used Ports,Configured Ports,MTU,CDP "
                       "Status,Beacon Timeout,Uplinks,Talvex Branded,DVPort"}}});
}

InputSpecPtr VirtualSwitchDVSTalvexList::GetInputSpecInternal() {
    return Frame::MakeInputSpec({{"qbr-name", "v", Frame::kString,
                                  "Limit the output of this command to only qBR with the given name."}});
}

OutputSpecPtr VirtualSwitchDVSTalvexList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr VirtualSwitchDVSTalvexList::GetOutputStructure() {
    return Frame::MakeRecord(
        "QBR", {Frame::StringField("Name"), Frame::StringField("QBR ID"), Frame::StringField("Class"),
                Frame::IntField("Num Ports"), Frame::IntField("Used Ports"),
                Frame::IntField("Configured Ports"), Frame::IntField("MTU"), Frame::StringField("CDP Status"),
                Frame::IntField("Beacon Timeout"), Frame::StringListField("Uplinks"),
                Frame::BoolField("Talvex Branded"), Frame::RecordListField("DVPort", GetDVPortStructure())});
}

RecordPtr VirtualSwitchDVSTalvexList::GetDVPortStructure() {
    return Frame::MakeRecord("DVPort",
                             {Frame::StringField("Port ID"), Frame::BoolField("In Use"),
                              Frame::StringField("DVPortgroup ID"), Frame::StringListField("Client")});
}

ListPtr VirtualSwitchDVSTalvexList::GetDVPortList(
    const std::vector<std::unique_ptr<HostCtl::Network::DVPort>>& ports) {
    auto list = Frame::MakeList(GetDVPortStructure());
    for (const auto& port : ports) {
        // Only the library's own distributed ports are known to answer for their switch.
        if (!dynamic_cast<const TknCtl::Network::DVPortImpl*>(port.get())) continue;
        std::vector<std::string> clients;
        bool inUse = port->GetInUse(clients);
        auto record = GetDVPortStructure();
        record->SetField("Port ID", port->GetPortId());
        record->SetField("In Use", inUse);
        record->SetField("DVPortgroup ID", port->GetDVPortgroupId());
        record->SetField("Client", clients);
        list->Add(record);
    }
    return list;
}

void VirtualSwitchDVSTalvexList::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        const std::string& name = input->GetParameter("qbr-name");
        std::vector<std::unique_ptr<HostCtl::Network::DVSwitch>> switches;
        if (name.empty()) {
            TknCtl::Network::VirtualSwitchInfoImpl info;
            switches = info.GetDVSwitches();
        } else {
            switches.push_back(HostCtl::Network::NetworkFactory::GetDVSwitchByName(name));
        }

        std::vector<std::string> pnics;
        {
            TknCtl::Network::NetworkInfoImpl network;
            for (const auto& pnic : network.GetPnics()) {
                if (pnic) pnics.push_back(pnic->GetName());
            }
        }

        auto list = Frame::MakeList(GetOutputStructure());
        for (const auto& entry : switches) {
            const auto* dvs = dynamic_cast<const TknCtl::Network::DVSwitchImpl*>(entry.get());
            if (!dvs) {
                output->AddErrorMessage("Unable to access all qBR");
                break;
            }
            auto record = GetOutputStructure();
            record->SetField("Name", dvs->GetDvsName());
            record->SetField("QBR ID", dvs->GetUuid());
            record->SetField("Class", dvs->GetClassName());
            record->SetField("Num Ports", dvs->GetNumPorts());
            record->SetField("Used Ports", dvs->GetNumUsedPorts());
            record->SetField("Configured Ports", dvs->GetNumConfiguredPorts());
            record->SetField("MTU", dvs->GetMtu());
            record->SetField("CDP Status", dvs->GetCdpStatus());
            record->SetField("Beacon Timeout", static_cast<long>(dvs->GetBeaconTimeout()));
            record->SetField("Talvex Branded", dvs->IsBranded());
            record->SetField("DVPort", GetDVPortList(dvs->GetDVPorts()));
            std::vector<std::string> uplinks;
            for (const auto& uplink : dvs->GetUplinkNames()) {
                if (std::find(pnics.begin(), pnics.end(), uplink) != pnics.end()) uplinks.push_back(uplink);
            }
            record->SetField("Uplinks", uplinks);
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace
