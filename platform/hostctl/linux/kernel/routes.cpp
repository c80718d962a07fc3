#include "kernel/routes.h"

#include <linux/rtnetlink.h>
#include <netlink/attr.h>
#include <netlink/msg.h>
#include <sys/socket.h>

#include <memory>

#include "core/text.h"
#include "hostctl/exception.h"
#include "kernel/request.h"

namespace TknCtl::Linux::Kernel {

using HostCtl::Lib::HostCtlException;

namespace {

// The next hops of RTA_MULTIPATH: a list of rtnexthop, each followed by its attributes.
void ParseMultipath(int family, nlattr* multipath, std::vector<Nexthop>& out) {
    const char* data = static_cast<const char*>(nla_data(multipath));
    int remaining = nla_len(multipath);
    while (remaining >= static_cast<int>(sizeof(rtnexthop))) {
        const auto* hop = reinterpret_cast<const rtnexthop*>(data);
        if (hop->rtnh_len < sizeof(rtnexthop) || hop->rtnh_len > remaining) break;
        Nexthop next;
        next.index = hop->rtnh_ifindex;
        int attrLength = hop->rtnh_len - static_cast<int>(RTNH_LENGTH(0));
        if (attrLength > 0) {
            nlattr* tb[RTA_MAX + 1] = {};
            auto* attrs = reinterpret_cast<nlattr*>(const_cast<char*>(data) + RTNH_LENGTH(0));
            if (nla_parse(tb, RTA_MAX, attrs, attrLength, nullptr) == 0)
                next.gateway = AttributeAddress(family, tb[RTA_GATEWAY]);
        }
        out.push_back(std::move(next));
        int step = static_cast<int>(RTNH_ALIGN(hop->rtnh_len));
        data += step;
        remaining -= step;
    }
}

}  // namespace

std::string DescribeRoute(const Route& route) {
    std::string text = route.IsDefault() ? std::string("default")
                                         : route.destination + "/" + std::to_string(route.prefixLength);
    if (!route.nexthops.empty() && !route.nexthops.front().gateway.empty())
        text += " via " + route.nexthops.front().gateway;
    return text;
}

std::optional<Route> ParseRoute(const nlmsghdr* message) {
    auto* header = const_cast<nlmsghdr*>(message);
    if (header->nlmsg_type != RTM_NEWROUTE || !nlmsg_valid_hdr(header, sizeof(rtmsg))) return std::nullopt;
    const auto* info = static_cast<const rtmsg*>(nlmsg_data(header));
    if (info->rtm_flags & RTM_F_CLONED) return std::nullopt;
    nlattr* tb[RTA_MAX + 1] = {};
    if (nlmsg_parse(header, sizeof(rtmsg), tb, RTA_MAX, nullptr) < 0) return std::nullopt;

    Route out;
    out.family = info->rtm_family;
    if (out.family != AF_INET && out.family != AF_INET6) return std::nullopt;
    out.prefixLength = info->rtm_dst_len;
    out.table = tb[RTA_TABLE] ? nla_get_u32(tb[RTA_TABLE]) : info->rtm_table;
    out.protocol = info->rtm_protocol;
    out.type = info->rtm_type;
    out.scope = info->rtm_scope;
    out.destination = AttributeAddress(out.family, tb[RTA_DST]);
    if (out.destination.empty()) out.destination = out.family == AF_INET ? "0.0.0.0" : "::";
    if (tb[RTA_PRIORITY]) out.metric = nla_get_u32(tb[RTA_PRIORITY]);
    out.preferredSource = AttributeAddress(out.family, tb[RTA_PREFSRC]);
    if (tb[RTA_MULTIPATH]) {
        ParseMultipath(out.family, tb[RTA_MULTIPATH], out.nexthops);
    } else {
        Nexthop hop;
        hop.gateway = AttributeAddress(out.family, tb[RTA_GATEWAY]);
        if (tb[RTA_OIF]) hop.index = static_cast<int>(nla_get_u32(tb[RTA_OIF]));
        if (hop.index != 0 || !hop.gateway.empty()) out.nexthops.push_back(std::move(hop));
    }
    return out;
}

std::vector<Route> ListRoutes(const Namespace& ns, int family, unsigned table, bool defaultsOnly) {
    std::vector<Route> out;
    rtmsg header{};
    header.rtm_family = static_cast<unsigned char>(family);
    // The kernel walks that table alone (the local table of a host of many addresses is large).
    if (table > 0 && table < 256) header.rtm_table = static_cast<unsigned char>(table);
    Dump(
        ns, RTM_GETROUTE, &header, sizeof(header), [&] { out.clear(); },
        [&](const nlmsghdr* message) {
            // What is not wanted is told by the header and one attribute.
            auto* reply = const_cast<nlmsghdr*>(message);
            if (reply->nlmsg_type != RTM_NEWROUTE || !nlmsg_valid_hdr(reply, sizeof(rtmsg))) return;
            const auto* info = static_cast<const rtmsg*>(nlmsg_data(reply));
            if (defaultsOnly && info->rtm_dst_len != 0) return;
            if (table != 0) {
                nlattr* attr = nlmsg_find_attr(reply, sizeof(rtmsg), RTA_TABLE);
                if ((attr ? nla_get_u32(attr) : info->rtm_table) != table) return;
            }
            if (auto route = ParseRoute(message)) out.push_back(std::move(*route));
        },
        "cannot list the routes");
    return out;
}

nl_msg* BuildRouteRequest(int type, const Route& route) {
    if (route.family != AF_INET && route.family != AF_INET6)
        throw HostCtlException("Invalid route family " + std::to_string(route.family));
    if (route.nexthops.size() > 1)
        throw HostCtlException("A route of several next hops cannot be built here");
    int length = route.family == AF_INET ? 4 : 16;
    unsigned char destination[16];
    if (!AddressBytes(route.family, route.destination, destination))
        throw HostCtlException("Invalid route destination " + Lib::Quote(route.destination));
    if (route.prefixLength > static_cast<unsigned>(length * 8))
        throw HostCtlException("Invalid prefix length " + std::to_string(route.prefixLength));

    int flags = type == RTM_NEWROUTE ? NLM_F_CREATE | NLM_F_EXCL : 0;
    std::unique_ptr<nl_msg, void (*)(nl_msg*)> message(nlmsg_alloc_simple(type, flags), nlmsg_free);
    if (!message) throw HostCtlException("out of memory");
    rtmsg info{};
    info.rtm_family = static_cast<unsigned char>(route.family);
    info.rtm_dst_len = static_cast<unsigned char>(route.prefixLength);
    info.rtm_table = static_cast<unsigned char>(route.table < 256 ? route.table : RT_TABLE_UNSPEC);
    info.rtm_protocol = static_cast<unsigned char>(route.protocol);
    info.rtm_type = static_cast<unsigned char>(route.type);
    info.rtm_scope = static_cast<unsigned char>(route.scope);
    if (type == RTM_DELROUTE) info.rtm_scope = RT_SCOPE_NOWHERE;  // any scope
    bool ok = nlmsg_append(message.get(), &info, sizeof(info), NLMSG_ALIGNTO) == 0 &&
              nla_put_u32(message.get(), RTA_TABLE, route.table) == 0;
    if (route.prefixLength > 0) ok = ok && nla_put(message.get(), RTA_DST, length, destination) == 0;
    if (route.metric != 0) ok = ok && nla_put_u32(message.get(), RTA_PRIORITY, route.metric) == 0;
    if (!route.preferredSource.empty()) {
        unsigned char source[16];
        if (!AddressBytes(route.family, route.preferredSource, source))
            throw HostCtlException("Invalid preferred source " + Lib::Quote(route.preferredSource));
        ok = ok && nla_put(message.get(), RTA_PREFSRC, length, source) == 0;
    }
    if (!route.nexthops.empty()) {
        const Nexthop& hop = route.nexthops.front();
        if (!hop.gateway.empty()) {
            unsigned char gateway[16];
            if (!AddressBytes(route.family, hop.gateway, gateway))
                throw HostCtlException("Invalid gateway " + Lib::Quote(hop.gateway));
            ok = ok && nla_put(message.get(), RTA_GATEWAY, length, gateway) == 0;
        }
        if (hop.index != 0)
            ok = ok && nla_put_u32(message.get(), RTA_OIF, static_cast<std::uint32_t>(hop.index)) == 0;
    }
    if (!ok) throw HostCtlException("cannot build a route request: message too large");
    return message.release();
}

void AddRoute(const Namespace& ns, const Route& route) {
    Request(ns, BuildRouteRequest(RTM_NEWROUTE, route), "Cannot add route " + DescribeRoute(route));
}

void DeleteRoute(const Namespace& ns, const Route& route) {
    Request(ns, BuildRouteRequest(RTM_DELROUTE, route), "Cannot remove route " + DescribeRoute(route));
}

}  // namespace TknCtl::Linux::Kernel
