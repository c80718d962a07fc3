#include "commands/ip_interface/ip_interface.h"

namespace TalvexCli::NetworkNamespace {

IpInterfaceTagGet::IpInterfaceTagGet() {
    SetDescription("Gets the tags set on the given Tarkon network interface.");
    SetMetaDataField("type", "fetcher");
    SetDefaultOutputParameter("fields:InterfaceTag", "Tags");
    SetDefaultOutputParameter("header:InterfaceTag", "<NONE>");
    SetDefaultOutputFormatter("simple");
}

InputSpecPtr IpInterfaceTagGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({{"interface-name", "i", Frame::kString,
                                  "Name of tknnic whose tags are to be read", Frame::kRequired}});
}

OutputSpecPtr IpInterfaceTagGet::GetOutputSpecInternal() {
    return Frame::RecordOutput(GetOutputStructure());
}

RecordPtr IpInterfaceTagGet::GetOutputStructure() {
    return Frame::MakeRecord("InterfaceTag", {Frame::StringListField("Tags")});
}

void IpInterfaceTagGet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& name = input->GetParameter("interface-name");
    auto tags = Zorbel::MetaObj::MetaList::New(Zorbel::MetaObj::META_STRING);
    auto record = GetOutputStructure();
    Frame::HostCall(output, "Error getting tags on interface " + name + ". Error was : ", [&] {
        auto nic = IpInterface::FindByName(name);
        if (!nic) {
            output->AddErrorMessage("Unable to find an interface with name " + name);
            return;
        }
        std::vector<HostCtl::Network::TknNicTagType> types;
        nic->GetTags(types);
        for (auto type : types)
            tags->Add(TknCtl::Network::TknNicTagIdToName(type));
        record->SetField("Tags", tags);
        output->SetRootObject(record);
    });
}

}  // namespace TalvexCli::NetworkNamespace
