#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

VfList::VfList() {
    Frame::Describe(*this, {"Get the generic configuration of VFs for SRIOV NIC.",
                            "fetcher",
                            "table",
                            {{"fields:VFList", "VF ID,Active,PCI Address,Owner World ID"}}});
}

InputSpecPtr VfList::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{"nic-name", "n", Frame::kString,
          "The name of the SRIOV NIC to configured. This must be one of the cards listed in "
          "the sriovNic list command.",
          Frame::kRequired}});
}

OutputSpecPtr VfList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr VfList::GetOutputStructure() {
    return Frame::MakeRecord(
        "VFList", {Frame::IntField("VF ID"), Frame::BoolField("Active"), Frame::StringField("PCI Address"),
                   Frame::StringField("Owner World ID")});
}

void VfList::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("nic-name");
    Frame::HostCall(output, "Unable to get VF Info. Error:", [&] {
        TknCtl::Network::NetworkInfoImpl info;
        if (!info.GetSriovNicByName(name)) {
            output->AddErrorMessage("There is no SRIOV Nic with name " + name);
            return;
        }
        auto list = Frame::MakeList(GetOutputStructure());
        for (const auto& vf : info.GetSriovNicVFInfo(name)) {
            auto record = GetOutputStructure();
            record->SetField("VF ID", static_cast<long>(vf.vfId));
            record->SetField("Active", vf.active);
            record->SetField("PCI Address", vf.pciAddress);
            record->SetField("Owner World ID", vf.ownerWorldId);
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace
