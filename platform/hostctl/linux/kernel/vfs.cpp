#include "kernel/vfs.h"

#include <arpa/inet.h>
#include <linux/if_link.h>
#include <linux/netlink.h>
#include <linux/rtnetlink.h>
#include <netlink/attr.h>
#include <netlink/msg.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <memory>
#include <vector>

#include "hostctl/exception.h"
#include "kernel/request.h"

#ifndef SOL_NETLINK
#define SOL_NETLINK 270
#endif

namespace TknCtl::Linux::Kernel {

using HostCtl::Lib::HostCtlException;

namespace {

// The structure an attribute carries, copied out; nothing when the attribute is absent or too
// short for it.
template <class T>
std::optional<T> Struct(nlattr* attr) {
    if (!attr || nla_len(attr) < static_cast<int>(sizeof(T))) return std::nullopt;
    T value;
    std::memcpy(&value, nla_data(attr), sizeof(T));
    return value;
}

std::string MacText(const unsigned char* bytes, std::size_t length) {
    static const char digits[] = "0123456789abcdef";
    std::string text;
    for (std::size_t i = 0; i < length; ++i) {
        if (i) text += ':';
        text += digits[bytes[i] >> 4];
        text += digits[bytes[i] & 0xf];
    }
    return text;
}

// A setting the driver may leave unsaid: the kernel's -1 means it did not say.
std::optional<bool> Setting(std::uint32_t value) {
    if (value == static_cast<std::uint32_t>(-1)) return std::nullopt;
    return value != 0;
}

std::optional<VfConfig> ParseVf(nlattr* entry, std::size_t addressLength) {
    nlattr* tb[IFLA_VF_MAX + 1] = {};
    if (nla_parse_nested(tb, IFLA_VF_MAX, entry, nullptr) < 0) return std::nullopt;
    // Every VF the kernel reports has its MAC address, and with it its number.
    const auto mac = Struct<ifla_vf_mac>(tb[IFLA_VF_MAC]);
    if (!mac) return std::nullopt;
    VfConfig vf;
    vf.number = mac->vf;
    vf.mac = MacText(mac->mac, addressLength);

    if (tb[IFLA_VF_VLAN_LIST]) {
        nlattr* item = nullptr;
        int remaining = 0;
        nla_for_each_nested(item, tb[IFLA_VF_VLAN_LIST], remaining) {
            if (nla_type(item) != IFLA_VF_VLAN_INFO) continue;
            const auto vlan = Struct<ifla_vf_vlan_info>(item);
            if (!vlan || (vlan->vlan == 0 && vlan->qos == 0)) continue;
            vf.vlans.push_back({vlan->vlan, vlan->qos, ntohs(vlan->vlan_proto)});
        }
    } else if (const auto vlan = Struct<ifla_vf_vlan>(tb[IFLA_VF_VLAN]); vlan && (vlan->vlan || vlan->qos)) {
        vf.vlans.push_back({vlan->vlan, vlan->qos, 0x8100});
    }
    if (const auto spoof = Struct<ifla_vf_spoofchk>(tb[IFLA_VF_SPOOFCHK]))
        vf.spoofCheck = Setting(spoof->setting);
    if (const auto trust = Struct<ifla_vf_trust>(tb[IFLA_VF_TRUST])) vf.trust = Setting(trust->setting);
    if (const auto state = Struct<ifla_vf_link_state>(tb[IFLA_VF_LINK_STATE])) {
        vf.linkState = state->link_state == IFLA_VF_LINK_STATE_ENABLE    ? VfLinkState::kEnable
                       : state->link_state == IFLA_VF_LINK_STATE_DISABLE ? VfLinkState::kDisable
                                                                         : VfLinkState::kAuto;
    }
    if (const auto rate = Struct<ifla_vf_rate>(tb[IFLA_VF_RATE])) {
        vf.minRate = rate->min_tx_rate;
        vf.maxRate = rate->max_tx_rate;
    } else if (const auto txRate = Struct<ifla_vf_tx_rate>(tb[IFLA_VF_TX_RATE])) {
        vf.maxRate = txRate->rate;  // kernels before minimum rates
    }
    if (tb[IFLA_VF_STATS]) {
        nlattr* stats[IFLA_VF_STATS_MAX + 1] = {};
        if (nla_parse_nested(stats, IFLA_VF_STATS_MAX, tb[IFLA_VF_STATS], nullptr) == 0) {
            // nla_get_u64 gives 0 for a counter that is absent or too short.
            auto counter = [&](int type) { return stats[type] ? nla_get_u64(stats[type]) : 0; };
            VfCounters& c = vf.counters.emplace();
            c.rxPackets = counter(IFLA_VF_STATS_RX_PACKETS);
            c.txPackets = counter(IFLA_VF_STATS_TX_PACKETS);
            c.rxBytes = counter(IFLA_VF_STATS_RX_BYTES);
            c.txBytes = counter(IFLA_VF_STATS_TX_BYTES);
            c.broadcast = counter(IFLA_VF_STATS_BROADCAST);
            c.multicast = counter(IFLA_VF_STATS_MULTICAST);
            c.rxDropped = counter(IFLA_VF_STATS_RX_DROPPED);
            c.txDropped = counter(IFLA_VF_STATS_TX_DROPPED);
        }
    }
    return vf;
}

}  // namespace

nl_msg* BuildVfRequest(int index, bool withCounters) {
    nl_msg* message = nlmsg_alloc_simple(RTM_GETLINK, NLM_F_REQUEST);
    if (!message) throw HostCtlException("out of memory");
    ifinfomsg header{};
    header.ifi_family = AF_UNSPEC;
    header.ifi_index = index;
    const std::uint32_t mask = RTEXT_FILTER_VF | (withCounters ? 0u : RTEXT_FILTER_SKIP_STATS);
    if (nlmsg_append(message, &header, sizeof(header), NLMSG_ALIGNTO) < 0 ||
        nla_put_u32(message, IFLA_EXT_MASK, mask) < 0) {
        nlmsg_free(message);
        throw HostCtlException("out of memory");
    }
    return message;
}

std::optional<LinkVfs> ParseVfs(const nlmsghdr* message) {
    auto* header = const_cast<nlmsghdr*>(message);
    if (header->nlmsg_type != RTM_NEWLINK || !nlmsg_valid_hdr(header, sizeof(ifinfomsg))) return std::nullopt;
    nlattr* tb[IFLA_MAX + 1] = {};
    if (nlmsg_parse(header, sizeof(ifinfomsg), tb, IFLA_MAX, nullptr) < 0) return std::nullopt;
    LinkVfs out;
    out.index = static_cast<const ifinfomsg*>(nlmsg_data(header))->ifi_index;
    if (tb[IFLA_IFNAME]) {
        const char* name = static_cast<const char*>(nla_data(tb[IFLA_IFNAME]));
        out.name.assign(name, strnlen(name, static_cast<std::size_t>(nla_len(tb[IFLA_IFNAME]))));
    }
    // The VFs' addresses are as long as the PF's (the kernel's buffer holds up to 32 bytes).
    std::size_t addressLength = 6;
    if (tb[IFLA_ADDRESS] && nla_len(tb[IFLA_ADDRESS]) > 0)
        addressLength = std::min<std::size_t>(static_cast<std::size_t>(nla_len(tb[IFLA_ADDRESS])), 32);
    if (tb[IFLA_NUM_VF] && nla_len(tb[IFLA_NUM_VF]) >= 4) out.numVfs = nla_get_u32(tb[IFLA_NUM_VF]);
    if (tb[IFLA_VFINFO_LIST]) {
        out.reported = true;
        nlattr* entry = nullptr;
        int remaining = 0;
        nla_for_each_nested(entry, tb[IFLA_VFINFO_LIST], remaining) {
            if (nla_type(entry) != IFLA_VF_INFO) continue;
            if (auto vf = ParseVf(entry, addressLength)) out.vfs.push_back(std::move(*vf));
        }
    }
    return out;
}

namespace {

// A netlink socket of the request's own, opened in the namespace: the reply to a link with
// many VFs may be larger than a shared socket's buffer, so it is read here at its full size.
class VfSocket {
public:
    explicit VfSocket(const Namespace& ns) {
        int error = 0;
        ns.Run([&] {
            fd_ = socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, NETLINK_ROUTE);
            error = errno;
        });
        if (fd_ < 0)
            throw HostCtlException(std::string("cannot open a netlink socket: ") + std::strerror(error));
        int one = 1;
        static_cast<void>(setsockopt(fd_, SOL_NETLINK, NETLINK_EXT_ACK, &one, sizeof(one)));
    }
    ~VfSocket() { close(fd_); }
    VfSocket(const VfSocket&) = delete;
    VfSocket& operator=(const VfSocket&) = delete;
    int Fd() const { return fd_; }

private:
    int fd_ = -1;
};

struct MessageFree {
    void operator()(nl_msg* message) const { nlmsg_free(message); }
};

}  // namespace

LinkVfs ReadVfs(const Namespace& ns, int index, bool withCounters, const std::string& name) {
    const std::string what = "Cannot read the VFs of " + name;
    std::unique_ptr<nl_msg, MessageFree> request(BuildVfRequest(index, withCounters));
    nlmsghdr* header = nlmsg_hdr(request.get());
    header->nlmsg_seq = 1;
    VfSocket sock(ns);
    sockaddr_nl kernel{};
    kernel.nl_family = AF_NETLINK;
    if (sendto(sock.Fd(), header, header->nlmsg_len, 0, reinterpret_cast<sockaddr*>(&kernel),
               sizeof(kernel)) < 0)
        throw HostCtlException(what + ": " + std::strerror(errno));
    std::vector<char> buffer;
    for (;;) {
        // The size of the next reply first, then the reply.
        ssize_t length = recv(sock.Fd(), nullptr, 0, MSG_PEEK | MSG_TRUNC);
        if (length < 0 && errno == EINTR) continue;
        if (length < 0) throw HostCtlException(what + ": " + std::strerror(errno));
        buffer.resize(std::max<std::size_t>(static_cast<std::size_t>(length), NLMSG_HDRLEN));
        length = recv(sock.Fd(), buffer.data(), buffer.size(), 0);
        if (length < 0 && errno == EINTR) continue;
        if (length < 0) throw HostCtlException(what + ": " + std::strerror(errno));
        int remaining = static_cast<int>(length);
        for (auto* reply = reinterpret_cast<nlmsghdr*>(buffer.data()); nlmsg_ok(reply, remaining);
             reply = nlmsg_next(reply, &remaining)) {
            if (reply->nlmsg_seq != 1) continue;
            if (reply->nlmsg_type == NLMSG_ERROR) {
                const Answer answer = ParseAnswer(reply);
                if (answer.error != 0) throw HostCtlException(what + ": " + RefusalText(answer));
            }
            auto vfs = ParseVfs(reply);
            if (!vfs) throw HostCtlException(what + ": the kernel answered with no link");
            return *vfs;
        }
    }
}

}  // namespace TknCtl::Linux::Kernel
