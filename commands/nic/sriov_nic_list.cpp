#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

SriovNicList::SriovNicList() {
    Frame::Describe(
        *this,
        {"This command will list the SRIOV Enabled NICs (PFs) currently installed and loaded on "
         "the system.",
         "fetcher",
         "table",
         {{"fields:SriovNic", "Name,PCI Device,Driver,Link,Speed,Duplex,MAC Address,MTU,Description"}}});
}

InputSpecPtr SriovNicList::GetInputSpecInternal() {
    return Frame::MakeInputSpec({});
}

OutputSpecPtr SriovNicList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr SriovNicList::GetOutputStructure() {
    return Frame::MakeRecord(
        "SriovNic",
        {Frame::StringField("Name"), Frame::StringField("PCI Device"), Frame::StringField("Driver"),
         Frame::StringField("Link"), Frame::IntField("Speed"), Frame::StringField("Duplex"),
         Frame::StringField("MAC Address"), Frame::IntField("MTU"), Frame::StringField("Description")});
}

void SriovNicList::ExecuteInternal(InputPtr, OutputPtr output) {
    Frame::HostCall(output, "Unable to list NICs.  Error was ", [&] {
        TknCtl::Network::NetworkInfoImpl info;
        auto list = Frame::MakeList(GetOutputStructure());
        for (const auto& pnic : info.GetSriovNics()) {
            if (!pnic) continue;
            auto record = GetOutputStructure();
            record->SetField("Name", pnic->GetName());
            std::string pci = "Pseudo", vendor = "Unknown", device = "Unknown";
            if (auto pciDevice = pnic->GetPciDevice()) {
                pci = pciDevice->GetAddressString();
                vendor = pciDevice->GetVendorName();
                device = pciDevice->GetDeviceName();
            }
            record->SetField("PCI Device", pci);
            record->SetField("Driver", pnic->GetDriverName());
            record->SetField("Link", Nic::UpDown(pnic->IsLinkUp()));
            record->SetField("Speed", pnic->GetLinkSpeed());
            record->SetField("Duplex", Nic::DuplexText(pnic->GetDuplex()));
            record->SetField("MAC Address", pnic->GetMacAddress().GetStringAddress());
            record->SetField("MTU", pnic->GetMtu());
            record->SetField("Description", vendor + " " + device);
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace
