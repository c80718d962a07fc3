#include "kernel/addresses.h"

#include <linux/if_addr.h>
#include <linux/rtnetlink.h>
#include <netlink/attr.h>
#include <netlink/msg.h>
#include <sys/socket.h>

#include <cstring>
#include <memory>

#include "core/text.h"
#include "hostctl/exception.h"
#include "kernel/request.h"

namespace TknCtl::Linux::Kernel {

using HostCtl::Lib::HostCtlException;

namespace {

std::string Describe(const Address& address) {
    return address.address + "/" + std::to_string(address.prefixLength);
}

// The directed broadcast of an IPv4 subnet; empty for /31 and /32, which have none.
std::string DirectedBroadcast(const unsigned char bytes[16], unsigned prefixLength) {
    if (prefixLength >= 31) return {};
    std::uint32_t value = (std::uint32_t(bytes[0]) << 24) | (std::uint32_t(bytes[1]) << 16) |
                          (std::uint32_t(bytes[2]) << 8) | bytes[3];
    value |= prefixLength == 0 ? 0xffffffffu : (0xffffffffu >> prefixLength);
    unsigned char out[4] = {static_cast<unsigned char>(value >> 24), static_cast<unsigned char>(value >> 16),
                            static_cast<unsigned char>(value >> 8), static_cast<unsigned char>(value)};
    return AddressText(AF_INET, out, 4);
}

}  // namespace

std::optional<Address> ParseAddress(const nlmsghdr* message) {
    auto* header = const_cast<nlmsghdr*>(message);
    if (header->nlmsg_type != RTM_NEWADDR || !nlmsg_valid_hdr(header, sizeof(ifaddrmsg))) return std::nullopt;
    const auto* info = static_cast<const ifaddrmsg*>(nlmsg_data(header));
    nlattr* tb[IFA_MAX + 1] = {};
    if (nlmsg_parse(header, sizeof(ifaddrmsg), tb, IFA_MAX, nullptr) < 0) return std::nullopt;

    Address out;
    out.family = info->ifa_family;
    out.index = static_cast<int>(info->ifa_index);
    out.prefixLength = info->ifa_prefixlen;
    out.scope = info->ifa_scope;
    out.flags = tb[IFA_FLAGS] ? nla_get_u32(tb[IFA_FLAGS]) : info->ifa_flags;
    // IFA_LOCAL is the address of this end; IFA_ADDRESS the other end of a point-to-point link
    // (the same address on other links).
    nlattr* local = tb[IFA_LOCAL];
    nlattr* remote = tb[IFA_ADDRESS];
    bool same = local && remote && nla_len(local) == nla_len(remote) &&
                std::memcmp(nla_data(local), nla_data(remote), static_cast<std::size_t>(nla_len(local))) == 0;
    out.address = AttributeAddress(out.family, local ? local : remote);
    if (local && remote && !same) out.peer = AttributeAddress(out.family, remote);
    if (out.address.empty()) return std::nullopt;
    out.broadcast = AttributeAddress(out.family, tb[IFA_BROADCAST]);
    if (tb[IFA_LABEL]) out.label = nla_get_string(tb[IFA_LABEL]);
    if (tb[IFA_PROTO]) out.protocol = nla_get_u8(tb[IFA_PROTO]);
    if (tb[IFA_CACHEINFO] && nla_len(tb[IFA_CACHEINFO]) >= static_cast<int>(sizeof(ifa_cacheinfo))) {
        const auto* cache = static_cast<const ifa_cacheinfo*>(nla_data(tb[IFA_CACHEINFO]));
        out.validLifetime = cache->ifa_valid;
        out.preferredLifetime = cache->ifa_prefered;
    }
    return out;
}

std::vector<Address> ListAddresses(const Namespace& ns, int family) {
    std::vector<Address> out;
    ifaddrmsg header{};
    header.ifa_family = static_cast<unsigned char>(family);
    Dump(
        ns, RTM_GETADDR, &header, sizeof(header), [&] { out.clear(); },
        [&](const nlmsghdr* message) {
            if (auto address = ParseAddress(message)) out.push_back(std::move(*address));
        },
        "cannot list the addresses");
    return out;
}

nl_msg* BuildAddressRequest(int type, const Address& address) {
    unsigned char local[16];
    if (!AddressBytes(address.family, address.address, local))
        throw HostCtlException("Invalid address " + Lib::Quote(address.address));
    std::size_t length = address.family == AF_INET ? 4 : 16;
    unsigned maxPrefix = address.family == AF_INET ? 32 : 128;
    if (address.prefixLength > maxPrefix)
        throw HostCtlException("Invalid prefix length " + std::to_string(address.prefixLength));
    unsigned char remote[16];
    std::memcpy(remote, local, sizeof(remote));
    if (!address.peer.empty() && !AddressBytes(address.family, address.peer, remote))
        throw HostCtlException("Invalid address " + Lib::Quote(address.peer));

    int flags = type == RTM_NEWADDR ? NLM_F_CREATE | NLM_F_EXCL : 0;
    std::unique_ptr<nl_msg, void (*)(nl_msg*)> message(nlmsg_alloc_simple(type, flags), nlmsg_free);
    if (!message) throw HostCtlException("out of memory");
    ifaddrmsg info{};
    info.ifa_family = static_cast<unsigned char>(address.family);
    info.ifa_prefixlen = static_cast<unsigned char>(address.prefixLength);
    info.ifa_index = static_cast<unsigned>(address.index);
    info.ifa_scope = static_cast<unsigned char>(address.scope);
    info.ifa_flags = static_cast<unsigned char>(address.flags & 0xff);
    bool ok = nlmsg_append(message.get(), &info, sizeof(info), NLMSG_ALIGNTO) == 0 &&
              nla_put(message.get(), IFA_LOCAL, static_cast<int>(length), local) == 0 &&
              nla_put(message.get(), IFA_ADDRESS, static_cast<int>(length), remote) == 0;
    if (type == RTM_NEWADDR) {
        if (address.flags > 0xff) ok = ok && nla_put_u32(message.get(), IFA_FLAGS, address.flags) == 0;
        std::string broadcast = address.broadcast;
        if (broadcast.empty() && address.family == AF_INET && address.peer.empty())
            broadcast = DirectedBroadcast(local, address.prefixLength);
        unsigned char bytes[16];
        if (!broadcast.empty() && AddressBytes(AF_INET, broadcast, bytes))
            ok = ok && nla_put(message.get(), IFA_BROADCAST, 4, bytes) == 0;
        if (!address.label.empty())
            ok = ok && nla_put_string(message.get(), IFA_LABEL, address.label.c_str()) == 0;
        if (address.validLifetime != kForever || address.preferredLifetime != kForever) {
            ifa_cacheinfo cache{};
            cache.ifa_valid = address.validLifetime;
            cache.ifa_prefered = address.preferredLifetime;
            ok = ok && nla_put(message.get(), IFA_CACHEINFO, sizeof(cache), &cache) == 0;
        }
    }
    if (!ok) throw HostCtlException("cannot build an address request: message too large");
    return message.release();
}

void AddAddress(const Namespace& ns, const Address& address, const std::string& device) {
    Request(ns, BuildAddressRequest(RTM_NEWADDR, address),
            "Cannot add address " + Describe(address) + " to " + device);
}

void DeleteAddress(const Namespace& ns, const Address& address, const std::string& device) {
    Request(ns, BuildAddressRequest(RTM_DELADDR, address),
            "Cannot remove address " + Describe(address) + " from " + device);
}

}  // namespace TknCtl::Linux::Kernel
