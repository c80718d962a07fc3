#include "kernel/neighbours.h"

#include <linux/neighbour.h>
#include <linux/rtnetlink.h>
#include <netlink/attr.h>
#include <netlink/msg.h>
#include <sys/socket.h>
#include <unistd.h>

#include <cctype>
#include <cstdio>
#include <memory>
#include <vector>

#include "core/text.h"
#include "hostctl/exception.h"
#include "kernel/request.h"

namespace TknCtl::Linux::Kernel {

using HostCtl::Lib::HostCtlException;

namespace {

std::string LinkLayerText(nlattr* attr) {
    if (!attr) return {};
    const auto* bytes = static_cast<const unsigned char*>(nla_data(attr));
    std::string text;
    char part[4];
    for (int i = 0; i < nla_len(attr); ++i) {
        std::snprintf(part, sizeof(part), i == 0 ? "%02x" : ":%02x", bytes[i]);
        text += part;
    }
    return text;
}

// The kernel counts the ages in clock ticks of the user interface (USER_HZ).
std::uint32_t Seconds(std::uint32_t ticks) {
    static const long perSecond = [] {
        long value = sysconf(_SC_CLK_TCK);
        return value > 0 ? value : 100;
    }();
    return static_cast<std::uint32_t>(ticks / static_cast<unsigned long>(perSecond));
}

}  // namespace

std::optional<Neighbour> ParseNeighbour(const nlmsghdr* message) {
    auto* header = const_cast<nlmsghdr*>(message);
    if (header->nlmsg_type != RTM_NEWNEIGH || !nlmsg_valid_hdr(header, sizeof(ndmsg))) return std::nullopt;
    const auto* info = static_cast<const ndmsg*>(nlmsg_data(header));
    if (info->ndm_family != AF_INET && info->ndm_family != AF_INET6) return std::nullopt;
    nlattr* tb[NDA_MAX + 1] = {};
    if (nlmsg_parse(header, sizeof(ndmsg), tb, NDA_MAX, nullptr) < 0 || !tb[NDA_DST]) return std::nullopt;

    Neighbour out;
    out.family = info->ndm_family;
    out.index = info->ndm_ifindex;
    out.state = info->ndm_state;
    out.flags = info->ndm_flags;
    out.address = AttributeAddress(out.family, tb[NDA_DST]);
    if (out.address.empty()) return std::nullopt;
    out.linkLayer = LinkLayerText(tb[NDA_LLADDR]);
    if (tb[NDA_CACHEINFO] && nla_len(tb[NDA_CACHEINFO]) >= static_cast<int>(sizeof(nda_cacheinfo))) {
        const auto* cache = static_cast<const nda_cacheinfo*>(nla_data(tb[NDA_CACHEINFO]));
        out.confirmedAge = Seconds(cache->ndm_confirmed);
        out.usedAge = Seconds(cache->ndm_used);
        out.updatedAge = Seconds(cache->ndm_updated);
    }
    return out;
}

std::vector<Neighbour> ListNeighbours(const Namespace& ns, int family) {
    std::vector<Neighbour> out;
    ndmsg header{};
    header.ndm_family = static_cast<unsigned char>(family);
    Dump(
        ns, RTM_GETNEIGH, &header, sizeof(header), [&] { out.clear(); },
        [&](const nlmsghdr* message) {
            if (auto neighbour = ParseNeighbour(message); neighbour && neighbour->family == family)
                out.push_back(std::move(*neighbour));
        },
        "cannot list the neighbours");
    return out;
}

nl_msg* BuildNeighbourDelete(const Neighbour& neighbour) {
    unsigned char address[16];
    if (!AddressBytes(neighbour.family, neighbour.address, address))
        throw HostCtlException("Invalid neighbour address " + Lib::Quote(neighbour.address));
    std::unique_ptr<nl_msg, void (*)(nl_msg*)> message(nlmsg_alloc_simple(RTM_DELNEIGH, 0), nlmsg_free);
    if (!message) throw HostCtlException("out of memory");
    ndmsg info{};
    info.ndm_family = static_cast<unsigned char>(neighbour.family);
    info.ndm_ifindex = neighbour.index;
    bool ok = nlmsg_append(message.get(), &info, sizeof(info), NLMSG_ALIGNTO) == 0 &&
              nla_put(message.get(), NDA_DST, neighbour.family == AF_INET ? 4 : 16, address) == 0;
    if (!ok) throw HostCtlException("cannot build a neighbour request: message too large");
    return message.release();
}

void DeleteNeighbour(const Namespace& ns, const Neighbour& neighbour, const std::string& device) {
    Request(ns, BuildNeighbourDelete(neighbour),
            "Cannot remove the neighbour entry of " + neighbour.address + " on " + device);
}

nl_msg* BuildNeighbourAdd(const Neighbour& neighbour) {
    unsigned char address[16];
    if (!AddressBytes(neighbour.family, neighbour.address, address))
        throw HostCtlException("Invalid neighbour address " + Lib::Quote(neighbour.address));
    // "aa:bb:..." as bytes: two hexadecimal digits each, separated by colons.
    std::vector<unsigned char> linkLayer;
    const std::string& text = neighbour.linkLayer;
    for (std::size_t i = 0; i < text.size(); i += 3) {
        unsigned value = 0;
        if (i + 2 > text.size() || (i + 2 < text.size() && text[i + 2] != ':') ||
            std::sscanf(text.substr(i, 2).c_str(), "%2x", &value) != 1 ||
            !std::isxdigit(static_cast<unsigned char>(text[i])) ||
            !std::isxdigit(static_cast<unsigned char>(text[i + 1])))
            throw HostCtlException("Invalid link-layer address " + Lib::Quote(text));
        linkLayer.push_back(static_cast<unsigned char>(value));
    }
    std::unique_ptr<nl_msg, void (*)(nl_msg*)> message(
        nlmsg_alloc_simple(RTM_NEWNEIGH, NLM_F_CREATE | NLM_F_REPLACE), nlmsg_free);
    if (!message) throw HostCtlException("out of memory");
    ndmsg info{};
    info.ndm_family = static_cast<unsigned char>(neighbour.family);
    info.ndm_ifindex = neighbour.index;
    info.ndm_state = neighbour.state;
    info.ndm_flags = neighbour.flags;
    bool ok = nlmsg_append(message.get(), &info, sizeof(info), NLMSG_ALIGNTO) == 0 &&
              nla_put(message.get(), NDA_DST, neighbour.family == AF_INET ? 4 : 16, address) == 0;
    if (!linkLayer.empty())
        ok = ok &&
             nla_put(message.get(), NDA_LLADDR, static_cast<int>(linkLayer.size()), linkLayer.data()) == 0;
    if (!ok) throw HostCtlException("cannot build a neighbour request: message too large");
    return message.release();
}

void AddNeighbour(const Namespace& ns, const Neighbour& neighbour, const std::string& device) {
    Request(ns, BuildNeighbourAdd(neighbour),
            "Cannot add the neighbour entry of " + neighbour.address + " on " + device);
}

std::optional<NeighbourTiming> ParseNeighbourTiming(const nlmsghdr* message) {
    auto* header = const_cast<nlmsghdr*>(message);
    if (header->nlmsg_type != RTM_NEWNEIGHTBL || !nlmsg_valid_hdr(header, sizeof(ndtmsg)))
        return std::nullopt;
    const auto* info = static_cast<const ndtmsg*>(nlmsg_data(header));
    if (info->ndtm_family != AF_INET && info->ndtm_family != AF_INET6) return std::nullopt;
    nlattr* tb[NDTA_MAX + 1] = {};
    if (nlmsg_parse(header, sizeof(ndtmsg), tb, NDTA_MAX, nullptr) < 0 || !tb[NDTA_PARMS])
        return std::nullopt;
    nlattr* parms[NDTPA_MAX + 1] = {};
    if (nla_parse_nested(parms, NDTPA_MAX, tb[NDTA_PARMS], nullptr) < 0) return std::nullopt;

    NeighbourTiming out;
    out.family = info->ndtm_family;
    if (parms[NDTPA_IFINDEX]) out.index = static_cast<int>(nla_get_u32(parms[NDTPA_IFINDEX]));
    if (parms[NDTPA_REACHABLE_TIME]) out.reachableTime = nla_get_u64(parms[NDTPA_REACHABLE_TIME]);
    if (parms[NDTPA_GC_STALETIME]) out.gcStaleTime = nla_get_u64(parms[NDTPA_GC_STALETIME]);
    if (parms[NDTPA_DELAY_PROBE_TIME]) out.delayProbeTime = nla_get_u64(parms[NDTPA_DELAY_PROBE_TIME]);
    return out;
}

std::vector<NeighbourTiming> ListNeighbourTimings(const Namespace& ns) {
    std::vector<NeighbourTiming> out;
    ndtmsg header{};
    header.ndtm_family = AF_UNSPEC;
    Dump(
        ns, RTM_GETNEIGHTBL, &header, sizeof(header), [&] { out.clear(); },
        [&](const nlmsghdr* message) {
            if (auto timing = ParseNeighbourTiming(message)) out.push_back(*timing);
        },
        "cannot read the neighbour tables' timings");
    return out;
}

}  // namespace TknCtl::Linux::Kernel
