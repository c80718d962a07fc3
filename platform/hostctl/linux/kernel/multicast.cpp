#include "kernel/multicast.h"

#include <arpa/inet.h>
#include <sys/socket.h>

#include <cctype>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <sstream>

#include "hostctl/exception.h"
#include "kernel/request.h"

namespace TknCtl::Linux::Kernel {

namespace {

bool HexValue(const std::string& text, unsigned long long& value) {
    if (text.empty() || text.size() > 16) return false;
    for (char c : text) {
        if (!std::isxdigit(static_cast<unsigned char>(c))) return false;
    }
    value = std::stoull(text, nullptr, 16);
    return true;
}

bool Decimal(const std::string& text, long long& value) {
    if (text.empty() || text.size() > 18) return false;
    for (std::size_t i = 0; i < text.size(); ++i) {
        if (!std::isdigit(static_cast<unsigned char>(text[i])) &&
            !(i == 0 && text[i] == '-' && text.size() > 1))
            return false;
    }
    value = std::stoll(text);
    return true;
}

// The text of a file of the calling thread's network namespace; empty when it has none.
std::string ReadNetFile(const char* name) {
    std::ifstream in(std::string("/proc/thread-self/net/") + name);
    std::ostringstream text;
    text << in.rdbuf();
    return text.str();
}

}  // namespace

std::vector<Membership> ParseIgmp(const std::string& text) {
    std::vector<Membership> out;
    std::istringstream lines(text);
    std::string line;
    int index = 0;
    std::string device;
    while (std::getline(lines, line)) {
        if (line.empty()) continue;
        if (line[0] != '\t') {
            // "2\teth0      :     1      V3" (the heading line starts with "Idx" and is no device)
            auto colon = line.find(':');
            std::istringstream fields(line.substr(0, colon));
            std::string indexText;
            long long value = 0;
            fields >> indexText >> device;
            index = colon != std::string::npos && Decimal(indexText, value) ? static_cast<int>(value) : 0;
            if (index == 0) device.clear();
            continue;
        }
        // "\t\t\t\t010000E0     1 0:00000000\t\t0": the group as the kernel holds it (network
        // byte order, printed as a number of this machine's byte order), then its users.
        std::istringstream fields(line);
        std::string groupText, usersText;
        fields >> groupText >> usersText;
        unsigned long long group = 0;
        long long users = 0;
        if (index == 0 || groupText.size() != 8 || !HexValue(groupText, group) ||
            !Decimal(usersText, users) || users < 0)
            continue;
        std::uint32_t raw = static_cast<std::uint32_t>(group);
        unsigned char bytes[4];
        std::memcpy(bytes, &raw, sizeof(bytes));
        out.push_back({index, device, AddressText(AF_INET, bytes, 4), static_cast<std::uint32_t>(users)});
    }
    return out;
}

std::vector<Membership> ParseIgmp6(const std::string& text) {
    std::vector<Membership> out;
    std::istringstream lines(text);
    std::string line;
    while (std::getline(lines, line)) {
        // "3    eth0            ff020000000000000000000000000001     1 0000000C 0"
        std::istringstream fields(line);
        std::string indexText, device, groupText, usersText;
        fields >> indexText >> device >> groupText >> usersText;
        long long index = 0, users = 0;
        if (!Decimal(indexText, index) || index <= 0 || groupText.size() != 32 ||
            !Decimal(usersText, users) || users < 0)
            continue;
        unsigned char bytes[16];
        bool valid = true;
        for (int i = 0; i < 16 && valid; ++i) {
            unsigned long long value = 0;
            valid = HexValue(groupText.substr(static_cast<std::size_t>(i) * 2, 2), value);
            bytes[i] = static_cast<unsigned char>(value);
        }
        if (!valid) continue;
        out.push_back({static_cast<int>(index), device, AddressText(AF_INET6, bytes, 16),
                       static_cast<std::uint32_t>(users)});
    }
    return out;
}

std::vector<Membership> ListMemberships(const Namespace& ns) {
    std::string igmp, igmp6;
    ns.Run([&] {
        igmp = ReadNetFile("igmp");
        igmp6 = ReadNetFile("igmp6");
    });
    std::vector<Membership> out = ParseIgmp(igmp);
    auto ipv6 = ParseIgmp6(igmp6);
    out.insert(out.end(), ipv6.begin(), ipv6.end());
    return out;
}

std::string EthernetGroupAddress(const std::string& group) {
    unsigned char bytes[16];
    unsigned char mac[6];
    if (AddressBytes(AF_INET, group, bytes)) {
        if ((bytes[0] & 0xf0) != 0xe0) return {};
        unsigned char out[6] = {0x01,     0x00,    0x5e, static_cast<unsigned char>(bytes[1] & 0x7f),
                                bytes[2], bytes[3]};
        std::memcpy(mac, out, sizeof(mac));
    } else if (AddressBytes(AF_INET6, group, bytes)) {
        if (bytes[0] != 0xff) return {};
        unsigned char out[6] = {0x33, 0x33, bytes[12], bytes[13], bytes[14], bytes[15]};
        std::memcpy(mac, out, sizeof(mac));
    } else {
        return {};
    }
    char text[18];
    std::snprintf(text, sizeof(text), "%02x:%02x:%02x:%02x:%02x:%02x", mac[0], mac[1], mac[2], mac[3], mac[4],
                  mac[5]);
    return text;
}

}  // namespace TknCtl::Linux::Kernel
