#include <map>

#include "commands/dvs/dvs.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace {

namespace {

const std::string kParamDvs = "dvs";

const std::string kRecord = "LACP";
const std::string kDvsName = "DVS Name";
const std::string kLagName = "LAG Name";
const std::string kLagId = "LAG ID";
const std::string kNics = "NICs";
const std::string kEnabled = "Enabled";
const std::string kMode = "Mode";
const std::string kLoadBalance = "Load balance";
const std::string kFields = kDvsName + "," + kLagName + "," + kLagId + "," + kNics + "," + kEnabled + "," +
                            kMode + "," + kLoadBalance;

// The LAG that stands for the switch-wide setting of the uplink port group.
const std::string kDefaultLagName = "default_uplink_pg_lag";

// Load-balancing names, by the LAG's load-balancing code.
const char* const kLoadBalancing[] = {"None",
                                      "Dst mac",
                                      "Src mac",
                                      "Src and dst mac",
                                      "Dst ip",
                                      "Src ip",
                                      "Src and dst ip",
                                      "Vlan",
                                      "Dst ip and vlan",
                                      "Src ip and vlan",
                                      "Src and dst ip, vlan",
                                      "Dst port",
                                      "Src port",
                                      "Src and dst port",
                                      "Dst ip and dst port",
                                      "Src ip and src port",
                                      "Src and dst ip, port",
                                      "Dst ip and dst port, vlan",
                                      "Src ip and src port, vlan",
                                      "Src and dst ip, port, vlan",
                                      "Src portID"};

std::string ModeText(bool enabled, std::uint32_t mode) {
    if (!enabled) return "";
    if (mode == 1) return "Active";
    if (mode == 2) return "Passive";
    return "None";
}

std::string LoadBalancingText(std::uint32_t code) {
    if (code < std::size(kLoadBalancing)) return kLoadBalancing[code];
    return "Unknown (" + std::to_string(code) + ")";
}

std::string Join(const std::vector<std::string>& names) {
    std::string text;
    for (const auto& name : names) {
        if (!text.empty()) text += ",";
        text += name;
    }
    return text;
}

}  // namespace

LacpGetConfig::LacpGetConfig() {
    Frame::Describe(*this,
                    {"Get LACP configuration on DVS", "fetcher", "table", {{"fields:" + kRecord, kFields}}});
}

InputSpecPtr LacpGetConfig::GetInputSpecInternal() {
    return Frame::MakeInputSpec(
        {{kParamDvs, "s", Frame::kString, "The name of DVS to get configuration on"}});
}

OutputSpecPtr LacpGetConfig::GetOutputSpecInternal() {
    return Frame::ListOutput(GetOutputStructure());
}

RecordPtr LacpGetConfig::GetOutputStructure() {
    return Frame::MakeRecord(
        kRecord, {Frame::StringField(kDvsName), Frame::StringField(kLagName), Frame::StringField(kLagId),
                  Frame::StringField(kNics), Frame::BoolField(kEnabled), Frame::StringField(kMode),
                  Frame::StringField(kLoadBalance)});
}

void LacpGetConfig::ExecuteInternal(InputPtr input, OutputPtr output) {
    Frame::HostCall(output, [&] {
        auto switches = Dvs::SelectLacpSwitches(*input);
        if (switches.empty()) {
            output->AddErrorMessage(
                "LACP is supported on Talvex DVSwitch only, and there is no DVSwitch configured on host.");
            return;
        }
        auto list = Frame::MakeList(GetOutputStructure());
        for (const auto& dvs : switches) {
            const std::string dvsName = dvs->GetDvsName();
            const auto config = dvs->GetLacpConfig();
            if (config.multipleLag) {
                for (const auto& lag : config.lags) {
                    std::vector<std::string> nics;
                    for (std::uint32_t i = 0; i < lag.uplinkCount; ++i) {
                        const std::string member = lag.name + "-" + std::to_string(i);
                        for (const auto& uplink : config.uplinks) {
                            if (uplink.name == member && !uplink.nic.empty()) nics.push_back(uplink.nic);
                        }
                    }
                    auto record = GetOutputStructure();
                    record->SetField(kDvsName, dvsName);
                    record->SetField(kLagName, lag.name);
                    record->SetField(kLagId, std::to_string(lag.id));
                    record->SetField(kNics, Join(nics));
                    record->SetField(kEnabled, true);
                    record->SetField(kMode, ModeText(true, lag.mode));
                    record->SetField(kLoadBalance, LoadBalancingText(lag.loadBalancing));
                    list->Add(record);
                }
                continue;
            }
            // Switch-wide: one LAG per uplink port group, carried by the uplink ports.
            struct Group {
                std::vector<std::string> nics;  // uplinks whose port has LACP on
                HostCtl::Network::DVPortLacpState last;
            };
            std::vector<std::string> order;
            std::map<std::string, Group> groups;
            for (const auto& uplink : config.uplinks) {
                auto port = HostCtl::Network::NetworkFactory::GetDVPort(uplink.port);
                if (!port) Frame::Fail("Unable to open the port of uplink " + uplink.name);
                const std::string portgroup = port->GetDVPortgroupId();
                const auto state = port->GetLacpState();
                if (!groups.count(portgroup)) order.push_back(portgroup);
                auto& group = groups[portgroup];
                if (state.enabled) group.nics.push_back(uplink.name);
                group.last = state;
            }
            for (const auto& portgroup : order) {
                const auto& group = groups[portgroup];
                if (group.nics.empty()) continue;
                auto record = GetOutputStructure();
                record->SetField(kDvsName, dvsName);
                record->SetField(kLagName, kDefaultLagName);
                record->SetField(kLagId, "0");
                record->SetField(kNics, Join(group.nics));
                record->SetField(kEnabled, group.last.enabled);
                record->SetField(kMode, ModeText(group.last.enabled, group.last.mode));
                record->SetField(kLoadBalance, "---");
                list->Add(record);
            }
        }
        if (list->Size() == 0) {
            output->AddErrorMessage("LACP is disabled on DVSwitch.");
            return;
        }
        output->SetRootObject(list);
    });
}

}  // namespace TalvexCli::NetworkNamespace
