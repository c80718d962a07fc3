#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

NicVlanStatsGet::NicVlanStatsGet() {
    Frame::Describe(*this,
                    {"List VLAN statistics for active VLAN's on the NIC.",
                     "fetcher",
                     "simple",
                     {{"header:NIC", "VLAN %VLAN ID%"}, {"fields:NIC", "Packets received,Packets sent"}}});
}

InputSpecPtr NicVlanStatsGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"nic-name", "n", Frame::kString, "Name of the NIC to get statistics from.", Frame::kRequired}});
}

OutputSpecPtr NicVlanStatsGet::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr NicVlanStatsGet::GetOutputStructure() {
    return Frame::MakeRecord("NIC", {Frame::IntField("VLAN ID"), Frame::IntField("Packets received"),
                                     Frame::IntField("Packets sent")});
}

void NicVlanStatsGet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("nic-name");
    Frame::HostCall(output, "Unable to get VLAN stats: ", [&] {
        TknCtl::Network::VirtualSwitchInfoImpl switches;
        auto portset = Nic::SwitchOfUplink(switches.GetAllSwitches(), name);
        if (!portset) {
            output->AddErrorMessage(name + " is not a valid NIC connected to any virtual switch.");
            return;
        }
        const auto stats = portset->GetVlanStats(name);
        if (stats.empty()) {
            output->AddErrorMessage("VLAN stats are disabled for " + name + " please enable them first.");
            return;
        }
        auto list = Frame::MakeList(GetOutputStructure());
        for (const auto& vlan : stats) {
            auto record = GetOutputStructure();
            record->SetField("VLAN ID", vlan.vlanId);
            record->SetField("Packets received", vlan.packetsReceived);
            record->SetField("Packets sent", vlan.packetsSent);
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace
