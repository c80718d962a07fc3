#include <vector>

#include "commands/nic/nic.h"
#include "hostctl/misc.h"
#include "hostctl/network/network_info.h"
#include "hostctl/network/nic.h"

namespace TalvexCli::NetworkNamespace {

NicList::NicList() {
    Frame::Describe(*this,
                    {"This command will list the Physical NICs currently installed and loaded on the system.",
                     "fetcher",
                     "table",
                     {{"fields:Nic",
                       "Name,PCI Device,Driver,Admin Status,Link Status,Speed,Duplex,MAC Address,MTU,"
                       "Description"}}});
}

InputSpecPtr NicList::GetInputSpecInternal() {
    return Frame::MakeInputSpec({});
}

OutputSpecPtr NicList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr NicList::GetOutputStructure() {
    return Frame::MakeRecord(
        "Nic",
        {Frame::StringField("Name"), Frame::StringField("PCI Device"), Frame::StringField("Driver"),
         Frame::StringField("Link"), Frame::StringField("Admin Status"), Frame::StringField("Link Status"),
         Frame::IntField("Speed"), Frame::StringField("Duplex"), Frame::StringField("MAC Address"),
         Frame::IntField("MTU"), Frame::StringField("Description")});
}

namespace {

// Vendor and device of a pseudo adapter: a USB adapter describes itself as
// "USB-NIC:<vendor>:<device>"; anything else is unknown.
void PseudoVendorAndDevice(const HostCtl::Network::Pnic& pnic, std::string& vendor, std::string& device) {
    vendor = device = "Unknown";
    try {
        // The description is looked at through a fixed buffer of 64 bytes.
        char buffer[64] = {};
        pnic.GetDeviceDescription().copy(buffer, sizeof buffer - 1);
        if (buffer[0] == '\0') return;
        std::vector<std::string> pieces;
        HostCtl::Misc::StringTokenize(buffer, pieces, ":");
        if (pieces.empty() || pieces[0] != "USB-NIC") return;
        if (pieces.size() > 1) vendor = pieces[1];
        if (pieces.size() > 2) device = pieces[2];
    } catch (const HostCtl::Lib::HostCtlException&) {
        vendor = device = "Unknown";
    }
}

}  // namespace

void NicList::ExecuteInternal(InputPtr, OutputPtr output) {
    Frame::HostCall(output, "Unable to list NICs.  Error was ", [&] {
        auto info = HostCtl::Network::NetworkFactory::GetNetworkInfo();
        auto list = Frame::MakeList(GetOutputStructure());
        for (const auto& pnic : info->GetPnics()) {
            if (!pnic) continue;
            auto record = GetOutputStructure();
            record->SetField("Name", pnic->GetName());
            std::string pci, vendor, device;
            if (auto pciDevice = pnic->GetPciDevice()) {
                pci = pciDevice->GetAddressString();
                vendor = pciDevice->GetVendorName();
                device = pciDevice->GetDeviceName();
            } else {
                pci = "Pseudo";
                PseudoVendorAndDevice(*pnic, vendor, device);
            }
            record->SetField("PCI Device", pci);
            record->SetField("Driver", pnic->GetDriverName());
            record->SetField("Link", Nic::UpDown(pnic->IsLinkUp()));
            record->SetField("Admin Status", Nic::UpDown(pnic->IsAdminUp()));
            record->SetField("Link Status", Nic::UpDown(pnic->IsLinkStatusUp()));
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
