#include "commands/ip/ip.h"
#include "hostctl/network/netstack.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

IpNetstackInstanceGet::IpNetstackInstanceGet() {
    Frame::Describe(*this, {"Get runtime/configuration settings for a given Netstack Instance.",
                            "fetcher",
                            "simple",
                            {{"header:NetstackInstance", "%Key%"},
                             {"fields:NetstackInstance",
                              "Key,Name,Enabled,Max Connections,Current Max Connections,Congestion Control "
                              "Algorithm,IPv6 Enabled,Current IPv6 Enabled,State"}}});
}

InputSpecPtr IpNetstackInstanceGet::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"netstack", "N", Frame::kString, "The network stack instance", Frame::kRequired},
    });
}

OutputSpecPtr IpNetstackInstanceGet::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr IpNetstackInstanceGet::GetOutputStructure() {
    return Frame::MakeRecord("NetstackInstance", {
                                                     Frame::StringField("Key"),
                                                     Frame::StringField("Name"),
                                                     Frame::BoolField("Enabled"),
                                                     Frame::IntField("Max Connections"),
                                                     Frame::IntField("Current Max Connections"),
                                                     Frame::StringField("Congestion Control Algorithm"),
                                                     Frame::BoolField("IPv6 Enabled"),
                                                     Frame::BoolField("Current IPv6 Enabled"),
                                                     Frame::IntField("State"),
                                                 });
}

void IpNetstackInstanceGet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& key = input->GetParameter("netstack");
    Frame::HostCall(output, "Error getting Netstack instance configuration. . Error was : ", [&] {
        TknCtl::Network::NetworkInfoImpl info;
        auto netstack = info.LookupNetstackInstanceByKey(key);
        if (!netstack) {
            output->AddErrorMessage("Unable to find a Netstack instance " + key);
            return;
        }
        auto record = GetOutputStructure();
        record->SetField("Key", netstack->GetKey());
        record->SetField("Name", netstack->GetName());
        std::uint32_t state = netstack->GetState();
        record->SetField("Enabled", state == HostCtl::Network::NETSTACK_STATE_ENABLED);
        record->SetField("Max Connections", netstack->GetMaxConnections());
        record->SetField("Current Max Connections", netstack->GetCurrentMaxConnections());
        record->SetField("Congestion Control Algorithm", netstack->GetCongestionControlAlgorithm());
        record->SetField("IPv6 Enabled", netstack->GetIpv6Enabled());
        record->SetField("Current IPv6 Enabled", netstack->GetCurrentIpv6Enabled());
        record->SetField("State", state);
        auto list = Frame::MakeList(GetOutputStructure());
        list->Add(record);
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace
