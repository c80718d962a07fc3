#include "commands/ip/ip.h"
#include "hostctl/network/ip.h"
#include "hostctl/network/network_info.h"
#include "hostctl/resource/world.h"

namespace TalvexCli::NetworkNamespace {

IpConnectionList::IpConnectionList() {
    Frame::Describe(
        *this, {"List active TCP/IP connections",
                "fetcher",
                "table",
                {{"fields:IpConnection",
                  "Proto,Recv Q,Send Q,Local Address,Foreign Address,State,World ID,CC Algo,World Name"}}});
}

InputSpecPtr IpConnectionList::GetInputSpecInternal() {
    return Frame::MakeInputSpec({
        {"netstack", "N", Frame::kString,
         "The network stack instance; if unspecified, use the default netstack instance"},
        {"type", "t", Frame::kString, "Connection type : %ENUM%", Frame::kOptional,
         Frame::StringEnum({{"ip", ""}, {"tcp", ""}, {"udp", ""}, {"all", ""}})},
    });
}

OutputSpecPtr IpConnectionList::GetOutputSpecInternal() {
    auto list = Frame::MakeList(GetOutputStructure());
    list->Add(GetOutputStructure());
    auto spec = Zorbel::CallSpec::OutputSpec::New();
    spec->SetRootObject(list);
    return spec;
}

RecordPtr IpConnectionList::GetOutputStructure() {
    return Frame::MakeRecord(
        "IpConnection", {Frame::StringField("Proto"), Frame::IntField("Recv Q"), Frame::IntField("Send Q"),
                         Frame::StringField("Local Address"), Frame::StringField("Foreign Address"),
                         Frame::StringField("State"), Frame::IntField("World ID"),
                         Frame::StringField("CC Algo"), Frame::StringField("World Name")});
}

namespace {

const char* const kTcpStates[] = {"CLOSED",      "LISTEN",     "SYN_SENT",   "RCVD",
                                  "ESTABLISHED", "CLOSE_WAIT", "FIN_WAIT_1", "CLOSING",
                                  "LAST_ACK",    "FIN_WAIT_2", "TIME_WAIT"};

std::string StateText(std::uint32_t state) {
    return state < std::size(kTcpStates) ? kTcpStates[state] : "";
}

std::string Endpoint(const std::string& address, std::uint16_t port) {
    if (address.find(':') != std::string::npos) return "[" + address + "]:" + std::to_string(port);
    return address + ":" + std::to_string(port);
}

}  // namespace

void IpConnectionList::ExecuteInternal(InputPtr input, OutputPtr output) {
    std::string netstack = Frame::Netstack(*input);
    std::string type = input->HasParameter("type") ? input->GetParameter("type") : std::string("all");
    Frame::HostCall(output, "Unable to get connection list.\n", [&] {
        TknCtl::Network::NetworkInfoImpl networkInfo;
        TknCtl::Resource::ResourceInfoImpl resources;
        auto list = Frame::MakeList(GetOutputStructure());
        const Frame::RecordMaker rows(GetOutputStructure());
        using Query = void (TknCtl::Network::NetworkInfoImpl::*)(
            std::vector<HostCtl::Network::TcpIpConnection>&, const std::string&);
        const std::pair<const char*, Query> queries[] = {
            {"tcp", &TknCtl::Network::NetworkInfoImpl::GetCurrentTcpTarkonConnections},
            {"udp", &TknCtl::Network::NetworkInfoImpl::GetCurrentUdpTarkonConnections},
            {"ip", &TknCtl::Network::NetworkInfoImpl::GetCurrentIpTarkonConnections},
        };
        for (const auto& [proto, query] : queries) {
            if (type != "all" && type != proto) continue;
            std::vector<HostCtl::Network::TcpIpConnection> connections;
            (networkInfo.*query)(connections, netstack);
            for (const auto& c : connections) {
                auto record = rows.New();
                record->SetField("Proto", proto);
                record->SetField("Recv Q", c.recvQ);
                record->SetField("Send Q", c.sendQ);
                record->SetField("Local Address", Endpoint(c.localAddress, c.localPort));
                record->SetField("Foreign Address", Endpoint(c.foreignAddress, c.foreignPort));
                record->SetField("State", StateText(c.state));
                record->SetField("CC Algo", c.ccAlgo);
                record->SetField("World ID", c.worldId);
                record->SetField("World Name", resources.GetWorldName(c.worldId));
                list->Add(record);
            }
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace
