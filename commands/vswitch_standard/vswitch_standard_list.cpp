#include <algorithm>
#include <set>

#include "commands/vswitch_standard/vswitch_standard.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

VirtualSwitchStandardList::VirtualSwitchStandardList() {
    Frame::Describe(
        *this, {"List the virtual switches current on the Hadro host.",
                "fetcher",
                "simple",
                {{"header:VirtualSwitch", "%Name%"},
                 {"fields:VirtualSwitch",
                  "Name,Class,Num Ports,Used Ports,Configured Ports,MTU,CDP Status,Beacon Enabled,Beacon "
                  "Interval,Beacon Threshold,Beacon Required By,Uplinks,Portgroups"}}});
}

InputSpecPtr VirtualSwitchStandardList::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"vswitch-name", "v", Frame::kString,
         "Limit the output of this command to only virtual switches with the given name."},
    });
}

OutputSpecPtr VirtualSwitchStandardList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr VirtualSwitchStandardList::GetOutputStructure() {
    return Frame::MakeRecord(
        "VirtualSwitch",
        {Frame::StringField("Name"), Frame::StringField("Class"), Frame::IntField("Num Ports"),
         Frame::IntField("Used Ports"), Frame::IntField("Configured Ports"), Frame::IntField("MTU"),
         Frame::StringField("CDP Status"), Frame::BoolField("Beacon Enabled"),
         Frame::IntField("Beacon Interval"), Frame::IntField("Beacon Threshold"),
         Frame::StringListField("Beacon Required By"), Frame::StringListField("Uplinks"),
         Frame::StringListField("Portgroups")});
}

void VirtualSwitchStandardList::ExecuteInternal(InputPtr input, OutputPtr output) {
    using HostCtl::Network::VirtualSwitch;
    Frame::HostCall(output, [&] {
        TknCtl::Network::VirtualSwitchInfoImpl info;
        std::vector<std::unique_ptr<VirtualSwitch>> switches;
        if (input->HasParameter("vswitch-name")) {
            switches.push_back(info.GetVirtualSwitchByName(input->GetParameter("vswitch-name")));
        } else {
            switches = info.GetVirtualSwitches();
        }
        std::set<std::string> pnics;
        TknCtl::Network::NetworkInfoImpl network;
        for (const auto& pnic : network.GetPnics()) {
            if (pnic) pnics.insert(pnic->GetName());
        }

        auto list = Frame::MakeList(GetOutputStructure());
        for (const auto& vswitch : switches) {
            if (!vswitch || !dynamic_cast<TknCtl::Network::VirtualSwitchImpl*>(vswitch.get())) {
                // The records gathered so far are still shown.
                output->AddErrorMessage("Unable to access all portsets");
                break;
            }
            auto record = GetOutputStructure();
            record->SetField("Name", vswitch->GetName());
            record->SetField("Class", vswitch->GetClassName());
            record->SetField("Num Ports", static_cast<long>(vswitch->GetNumPorts()));
            record->SetField("Used Ports", static_cast<long>(vswitch->GetNumUsedPorts()));
            record->SetField("Configured Ports", static_cast<long>(vswitch->GetNumConfiguredPorts()));
            record->SetField("MTU", vswitch->GetMtu());
            record->SetField("CDP Status", vswitch->GetCdpStatus());
            record->SetField("Beacon Enabled", vswitch->IsBeaconEnabled());
            record->SetField("Beacon Interval", vswitch->GetBeaconInterval());
            record->SetField("Beacon Threshold", vswitch->GetBeaconThreshold());
            record->SetField("Beacon Required By", vswitch->GetBeaconRequiredBy());
            auto uplinks = vswitch->GetUplinkNames();
            std::erase_if(uplinks, [&](const std::string& uplink) { return !pnics.count(uplink); });
            record->SetField("Uplinks", uplinks);
            std::vector<std::string> groups;
            for (const auto& group : vswitch->GetPortGroups())
                groups.push_back(group->GetName());
            record->SetField("Portgroups", groups);
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace
