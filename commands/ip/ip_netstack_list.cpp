#include "commands/ip/ip.h"
#include "hostctl/network/netstack.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

IpNetstackInstanceList::IpNetstackInstanceList() {
    Frame::Describe(*this,
                    {"This command will list the Tarkon Netstack instances currently known to the system.",
                     "fetcher",
                     "simple",
                     {{"header:NetstackInstance", "%Key%"}, {"fields:NetstackInstance", "Key,Name,State"}}});
}

InputSpecPtr IpNetstackInstanceList::GetInputSpecInternal() {
    return Frame::MakeInputSpec({});
}

OutputSpecPtr IpNetstackInstanceList::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr IpNetstackInstanceList::GetOutputStructure() {
    return Frame::MakeRecord("NetstackInstance", {Frame::StringField("Key"), Frame::StringField("Name"),
                                                  Frame::IntField("State")});
}

void IpNetstackInstanceList::ExecuteInternal(InputPtr, OutputPtr output) {
    Frame::HostCall(output, [&] {
        TknCtl::Network::NetworkInfoImpl info;
        auto list = Frame::MakeList(GetOutputStructure());
        for (const auto& netstack : info.ListNetstackInstances()) {
            if (!netstack) continue;
            auto record = GetOutputStructure();
            record->SetField("Key", netstack->GetKey());
            record->SetField("Name", netstack->GetName());
            record->SetField("State", netstack->GetState());
            list->Add(record);
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace
