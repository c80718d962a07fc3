// Helpers shared by the NIC commands.
#include <cstdio>
#include <limits>

#include "commands/nic/nic.h"
#include "hostctl/network/network_info.h"

namespace TalvexCli::NetworkNamespace::Nic {

const char* UpDown(bool up) {
    return up ? "Up" : "Down";
}

const char* OnOff(bool on) {
    return on ? "on" : "off";
}

const char* DuplexText(std::uint32_t duplex) {
    return duplex == 1 ? "Full" : "Half";
}

std::uint32_t Uint32Parameter(const Zorbel::CallSpec::Input& input, const std::string& name) {
    const std::int64_t value = input.GetParameterInt(name);
    if (value < 0 || value > std::numeric_limits<std::uint32_t>::max()) {
        Frame::Fail("Invalid value " + std::to_string(value) + " for --" + name +
                    ": expected a number from 0 to 4294967295.");
    }
    return static_cast<std::uint32_t>(value);
}

std::unique_ptr<HostCtl::Network::Portset> SwitchOfUplink(
    std::vector<std::unique_ptr<HostCtl::Network::Portset>> switches, const std::string& nic) {
    for (auto& portset : switches) {
        if (!portset) continue;
        for (const auto& uplink : portset->GetUplinkNames()) {
            if (uplink == nic) return std::move(portset);
        }
    }
    return nullptr;
}

void AddHexDumpLines(Zorbel::MetaObj::MetaList& list, const std::function<RecordPtr()>& makeRecord,
                     std::uint64_t start, const std::vector<std::uint8_t>& bytes) {
    std::uint64_t lineOffset = start - start % 16;
    std::string value(3 * (start % 16), ' ');
    auto emit = [&] {
        char offset[24];
        std::snprintf(offset, sizeof offset, "%04llx", static_cast<unsigned long long>(lineOffset));
        auto record = makeRecord();
        record->SetField("Offset", offset);
        record->SetField("Value", value);
        list.Add(record);
    };
    std::uint64_t position = start;
    for (std::uint8_t byte : bytes) {
        if (position % 16 == 0 && position != start) {
            emit();
            lineOffset += 16;
            value.clear();
        }
        char text[4];
        std::snprintf(text, sizeof text, "%02x ", byte);
        value += text;
        ++position;
    }
    emit();
}

void ForEachNetqueue(
    const std::string* name, const std::string& notFound,
    const std::function<void(HostCtl::Network::Pnic&, const HostCtl::Network::PnicNetqueueInfo&)>& visit) {
    auto info = HostCtl::Network::NetworkFactory::GetNetworkInfo();
    std::vector<std::unique_ptr<HostCtl::Network::Pnic>> pnics;
    if (name) {
        auto pnic = info->GetPnicByName(*name);
        if (!pnic) Frame::Fail(notFound);
        pnics.push_back(std::move(pnic));
    } else {
        pnics = info->GetPnics();
    }
    for (const auto& pnic : pnics) {
        if (!pnic) continue;
        HostCtl::Network::PnicNetqueueInfo netqueue;
        try {
            pnic->GetNetqueueInfo(netqueue);
        } catch (const HostCtl::Lib::HostCtlException&) {
            if (name) throw;
            continue;
        }
        visit(*pnic, netqueue);
    }
}

}  // namespace TalvexCli::NetworkNamespace::Nic
