#include "commands/ip/ip.h"
#include "hostctl/network/netstack.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

IpNetstackInstanceSet::IpNetstackInstanceSet() {
    Frame::Describe(*this, {"Configure settings for a given Netstack Instance.", "operation"});
}

InputSpecPtr IpNetstackInstanceSet::GetInputSpecInternal() {
    // The algorithms offered are the host's, as it names them now.
    std::vector<std::pair<std::string, std::string>> algorithms;
    for (const auto& name : TknCtl::Network::NetstackInstanceImpl::GetCongestionControlAlgorithmList())
        algorithms.emplace_back(name, "Set " + name + " as the algorithm");
    return Frame::MakeInputSpec({
        {"netstack", "N", Frame::kString,
         "The network stack instance. This name must be an interface listed in the netstack list command.",
         Frame::kRequired},
        {"enable", "e", Frame::kBool, "Enable the netstack instance (create in kernel)"},
        {"name", "n", Frame::kString, "The name for this netstack instance."},
        {"maxconn", "m", Frame::kInt,
         "The maximum number of connections for this netstack instance (applied only during netstack "
         "creation)."},
        {"ccalgo", "c", Frame::kString,
         "The TCP Congestion Contol Algorithm for this netstack instance (not applied to existing "
         "connections).: %FULLENUM%",
         Frame::kOptional, Frame::StringEnum(std::move(algorithms))},
        {"ipv6enabled", "i", Frame::kBool,
         "To enable IPv6 for this netstack instance (aplied only during netstack creation)."},
    });
}

OutputSpecPtr IpNetstackInstanceSet::GetOutputSpecInternal() {
    return Frame::BoolOutput();
}

void IpNetstackInstanceSet::ExecuteInternal(InputPtr input, OutputPtr output) {
    const std::string& key = input->GetParameter("netstack");
    // Settings applied before a failing step stay applied.
    Frame::HostCall(output,
                    "Error setting configuration for the netstack instance " + key + ". Error was : ", [&] {
                        TknCtl::Network::NetworkInfoImpl info;
                        auto netstack = info.LookupNetstackInstanceByKey(key);
                        if (!netstack) {
                            output->AddErrorMessage("Unable to find a Netstack instance " + key);
                            return;
                        }
                        if (const std::string& name = input->GetParameter("name"); !name.empty())
                            netstack->SetName(name, true);
                        if (input->HasParameter("enable")) {
                            if (input->GetParameterBool("enable")) {
                                netstack->Enable();
                            } else {
                                netstack->Disable();
                            }
                        }
                        if (input->HasParameter("maxconn")) {
                            std::int64_t maxConnections = input->GetParameterInt("maxconn");
                            netstack->SetMaxConnections(maxConnections, true);
                        }
                        if (const std::string& algorithm = input->GetParameter("ccalgo"); !algorithm.empty())
                            netstack->SetCongestionControlAlgorithm(algorithm, true);
                        if (input->HasParameter("ipv6enabled"))
                            netstack->SetIpv6Enabled(input->GetParameterBool("ipv6enabled"), true);
                        Frame::SetResult(output, true);
                    });
}

}  // namespace TalvexCli::NetworkNamespace
