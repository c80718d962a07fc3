#include <unordered_map>

#include "commands/dvs/dvs.h"
#include "hostctl/network/network_info.h"
#include "hostctl/resource/world.h"

namespace TalvexCli::NetworkNamespace {

namespace {

// A virtual machine's world is named with a five-character prefix ("vmm0:") before the VM's
// name; a name too short to carry it shows as empty.
std::string VmName(const std::string& worldName) {
    return worldName.size() > 5 ? worldName.substr(5) : "";
}

}  // namespace

VMList::VMList() {
    Frame::Describe(*this, {"List networking information for the VM's that have active ports.",
                            "fetcher",
                            "table",
                            {{"fields:VM", "World ID,Name,Num Ports,Networks"}}});
}

InputSpecPtr VMList::GetInputSpecInternal() {
    return Frame::MakeInputSpec({});
}

OutputSpecPtr VMList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr VMList::GetOutputStructure() {
    return Frame::MakeRecord("VM", {Frame::IntField("World ID"), Frame::StringField("Name"),
                                    Frame::IntField("Num Ports"), Frame::StringListField("Networks")});
}

void VMList::ExecuteInternal(InputPtr, OutputPtr output) {
    Frame::HostCall(output, "Unable to list VM's: ", [&] {
        auto list = Frame::MakeList(GetOutputStructure());
        const Frame::RecordMaker rows(GetOutputStructure());
        std::unordered_map<std::uint32_t, std::vector<std::string>> networks;

        TknCtl::Network::VirtualSwitchInfoImpl info;
        for (const auto& portset : info.GetAllSwitches()) {
            if (!portset) continue;
            const std::string name = portset->GetName();
            const bool byPortGroup = info.IsLegacySwitch(name) || info.IsOpaqueSwitch(name);
            const auto* dvs = byPortGroup || !info.IsDVSwitch(name)
                                  ? nullptr
                                  : dynamic_cast<const TknCtl::Network::DVSwitchImpl*>(portset.get());
            if (!byPortGroup && !dvs) continue;  // a switch kind without VM networks
            const std::string uuid = dvs ? dvs->GetUuid() : "";
            for (const auto& port : portset->GetPorts()) {
                if (!dynamic_cast<const TknCtl::Network::PortImpl*>(port.get())) continue;
                const std::uint32_t worldId = port->GetClientWorldId();
                if (worldId == 0) continue;
                if (byPortGroup) {
                    networks[worldId].push_back(port->GetPortGroupName());
                } else {
                    networks[worldId].push_back(
                        TknCtl::Network::DVPortImpl(uuid, port->GetDVPortId()).GetDVPortgroupId());
                }
            }
        }

        for (const auto& [worldId, names] : networks) {
            auto record = rows.New();
            record->SetField("World ID", worldId);
            record->SetField("Name", VmName(TknCtl::Resource::WorldImpl(worldId).GetWorldName()));
            record->SetField("Num Ports", names.size());
            record->SetField("Networks", names);
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace
