#include "kernel/ethtool.h"

#include <linux/ethtool.h>
#include <linux/ethtool_netlink.h>
#include <linux/genetlink.h>
#include <linux/netlink.h>
#include <linux/sockios.h>
#include <net/if.h>
#include <netlink/attr.h>
#include <netlink/genl/ctrl.h>
#include <netlink/genl/genl.h>
#include <netlink/handlers.h>
#include <netlink/msg.h>
#include <netlink/netlink.h>
#include <netlink/socket.h>
#include <sys/ioctl.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <memory>
#include <set>

#include "kernel/describe.h"
#include "kernel/dryrun.h"

#ifndef SOL_NETLINK
#define SOL_NETLINK 270
#endif

namespace TknCtl::Linux::Kernel {

using HostCtl::Lib::HostCtlException;

bool EthtoolRefusal::Unsupported() const {
    return code_ == EOPNOTSUPP || code_ == ENOTSUP;
}

std::string RefusalText(int code, const std::string& kernelMessage) {
    std::string text = kernelMessage.empty() ? std::string(std::strerror(code)) : kernelMessage;
    if (code == EPERM || code == EACCES) text += " (it needs root: CAP_NET_ADMIN)";
    return text;
}

// ---------------------------------------------------------------- bit sets and replies

const EthtoolBit* EthtoolBitset::Find(const std::string& name) const {
    for (const auto& bit : bits) {
        if (bit.name == name) return &bit;
    }
    return nullptr;
}

bool EthtoolBitset::IsOn(const std::string& name) const {
    const auto* bit = Find(name);
    return bit && bit->on;
}

std::uint32_t EthtoolBitset::Word() const {
    std::uint32_t word = 0;
    for (const auto& bit : bits) {
        if (bit.on && bit.index < 32) word |= 1u << bit.index;
    }
    return word;
}

std::uint32_t EthtoolBitset::MaskWord() const {
    std::uint32_t word = 0;
    for (const auto& bit : bits) {
        if (bit.index < 32) word |= 1u << bit.index;
    }
    return word;
}

std::uint64_t EthtoolReply::Value(int attribute, std::uint64_t fallback) const {
    auto it = values.find(attribute);
    return it == values.end() ? fallback : it->second;
}

const EthtoolBitset* EthtoolReply::Bitset(int attribute) const {
    auto it = bitsets.find(attribute);
    return it == bitsets.end() ? nullptr : &it->second;
}

namespace {

// The attributes of a reply that hold bit sets.
std::set<int> BitsetAttributes(std::uint8_t reply) {
    switch (reply) {
        case ETHTOOL_MSG_LINKMODES_GET_REPLY:
        case ETHTOOL_MSG_LINKMODES_NTF:
            return {ETHTOOL_A_LINKMODES_OURS, ETHTOOL_A_LINKMODES_PEER};
        case ETHTOOL_MSG_DEBUG_GET_REPLY:
            return {ETHTOOL_A_DEBUG_MSGMASK};
        case ETHTOOL_MSG_WOL_GET_REPLY:
            return {ETHTOOL_A_WOL_MODES};
        case ETHTOOL_MSG_FEATURES_GET_REPLY:
        case ETHTOOL_MSG_FEATURES_SET_REPLY:
            return {ETHTOOL_A_FEATURES_HW, ETHTOOL_A_FEATURES_WANTED, ETHTOOL_A_FEATURES_ACTIVE,
                    ETHTOOL_A_FEATURES_NOCHANGE};
        case ETHTOOL_MSG_PRIVFLAGS_GET_REPLY:
            return {ETHTOOL_A_PRIVFLAGS_FLAGS};
        case ETHTOOL_MSG_STATS_GET_REPLY:
            return {ETHTOOL_A_STATS_GROUPS};
        default:
            return {};
    }
}

bool IsBitOn(const void* data, int length, std::uint32_t index) {
    if (static_cast<int>(index / 32 * 4 + 4) > length) return false;
    std::uint32_t word;
    std::memcpy(&word, static_cast<const char*>(data) + index / 32 * 4, sizeof word);
    return (word >> (index % 32)) & 1;
}

EthtoolBitset ParseBitset(nlattr* set) {
    EthtoolBitset bitset;
    nlattr* value = nullptr;
    nlattr* mask = nullptr;
    std::uint32_t size = 0;
    nlattr* attr;
    int rem;
    nla_for_each_nested(attr, set, rem) {
        switch (nla_type(attr)) {
            case ETHTOOL_A_BITSET_NOMASK:
                bitset.list = true;
                break;
            case ETHTOOL_A_BITSET_SIZE:
                if (nla_len(attr) >= 4) size = nla_get_u32(attr);
                break;
            case ETHTOOL_A_BITSET_VALUE:
                value = attr;
                break;
            case ETHTOOL_A_BITSET_MASK:
                mask = attr;
                break;
            case ETHTOOL_A_BITSET_BITS: {
                nlattr* bitAttr;
                int bitRem;
                nla_for_each_nested(bitAttr, attr, bitRem) {
                    if (nla_type(bitAttr) != ETHTOOL_A_BITSET_BITS_BIT) continue;
                    EthtoolBit bit;
                    nlattr* field;
                    int fieldRem;
                    nla_for_each_nested(field, bitAttr, fieldRem) {
                        switch (nla_type(field)) {
                            case ETHTOOL_A_BITSET_BIT_INDEX:
                                if (nla_len(field) >= 4) bit.index = nla_get_u32(field);
                                break;
                            case ETHTOOL_A_BITSET_BIT_NAME:
                                bit.name.assign(static_cast<const char*>(nla_data(field)),
                                                strnlen(static_cast<const char*>(nla_data(field)),
                                                        static_cast<std::size_t>(nla_len(field))));
                                break;
                            case ETHTOOL_A_BITSET_BIT_VALUE:
                                bit.on = true;
                                break;
                        }
                    }
                    bitset.bits.push_back(std::move(bit));
                }
                break;
            }
        }
    }
    // A plain list names only the bits that are on.
    if (bitset.list) {
        for (auto& bit : bitset.bits)
            bit.on = true;
    }
    // The compact form: the value and (unless it is a list) the mask as arrays of 32-bit words.
    if (value && bitset.bits.empty()) {
        const std::uint32_t bits =
            std::min<std::uint32_t>(size, static_cast<std::uint32_t>(nla_len(value)) * 8);
        for (std::uint32_t index = 0; index < bits; ++index) {
            const bool on = IsBitOn(nla_data(value), nla_len(value), index);
            const bool listed = bitset.list || !mask ? on : IsBitOn(nla_data(mask), nla_len(mask), index);
            if (listed) bitset.bits.push_back({index, {}, on});
        }
    }
    return bitset;
}

EthtoolStatsGroup ParseStatsGroup(nlattr* group) {
    EthtoolStatsGroup out;
    nlattr* attr;
    int rem;
    nla_for_each_nested(attr, group, rem) {
        if (nla_type(attr) == ETHTOOL_A_STATS_GRP_ID && nla_len(attr) >= 4) {
            out.id = nla_get_u32(attr);
        } else if (nla_type(attr) == ETHTOOL_A_STATS_GRP_STAT) {
            // Each counter comes in a nest of its own, as an attribute named by its index.
            nlattr* counter;
            int counterRem;
            nla_for_each_nested(counter, attr, counterRem) {
                if (nla_len(counter) >= 8) out.counters[nla_type(counter)] = nla_get_u64(counter);
            }
        }
    }
    return out;
}

}  // namespace

std::optional<EthtoolReply> ParseEthtoolReply(nl_msg* message) {
    nlmsghdr* header = nlmsg_hdr(message);
    if (!header || header->nlmsg_len < NLMSG_HDRLEN + GENL_HDRLEN) return std::nullopt;
    if (header->nlmsg_type == NLMSG_ERROR || header->nlmsg_type == NLMSG_DONE) return std::nullopt;
    auto* generic = static_cast<genlmsghdr*>(nlmsg_data(header));
    EthtoolReply reply;
    reply.command = generic->cmd;
    const auto bitsets = BitsetAttributes(reply.command);
    nlattr* attr;
    int rem;
    nla_for_each_attr(attr, genlmsg_attrdata(generic, 0), genlmsg_attrlen(generic, 0), rem) {
        const int type = nla_type(attr);
        if (type == 1) continue;  // the reply header (ETHTOOL_A_*_HEADER) of every message
        if (bitsets.count(type)) {
            reply.bitsets[type] = ParseBitset(attr);
        } else if (reply.command == ETHTOOL_MSG_STATS_GET_REPLY && type == ETHTOOL_A_STATS_GRP) {
            reply.statsGroups.push_back(ParseStatsGroup(attr));
        } else if (!(attr->nla_type & NLA_F_NESTED)) {
            switch (nla_len(attr)) {
                case 1:
                    reply.values[type] = nla_get_u8(attr);
                    break;
                case 2:
                    reply.values[type] = nla_get_u16(attr);
                    break;
                case 4:
                    reply.values[type] = nla_get_u32(attr);
                    break;
                case 8:
                    reply.values[type] = nla_get_u64(attr);
                    break;
                default:
                    break;  // strings and binaries: none that this layer reads
            }
        }
    }
    return reply;
}

// ---------------------------------------------------------------- requests

namespace {

struct MessageFree {
    void operator()(nl_msg* message) const { nlmsg_free(message); }
};
using Message = std::unique_ptr<nl_msg, MessageFree>;

void Require(int result) {
    if (result < 0) throw HostCtlException("cannot build an ethtool request: " + ErrorText(result));
}

Message Start(int family, std::uint8_t command, const std::string& device, std::uint32_t flags) {
    Message message(nlmsg_alloc());
    if (!message) throw HostCtlException("cannot build an ethtool request: out of memory");
    if (!genlmsg_put(message.get(), NL_AUTO_PORT, NL_AUTO_SEQ, family, 0, NLM_F_ACK, command,
                     ETHTOOL_GENL_VERSION))
        throw HostCtlException("cannot build an ethtool request: out of memory");
    // Every request's header is its attribute 1 (ETHTOOL_A_*_HEADER).
    nlattr* header = nla_nest_start(message.get(), 1 | NLA_F_NESTED);
    if (!header) throw HostCtlException("cannot build an ethtool request: out of memory");
    Require(nla_put_string(message.get(), ETHTOOL_A_HEADER_DEV_NAME, device.c_str()));
    if (flags) Require(nla_put_u32(message.get(), ETHTOOL_A_HEADER_FLAGS, flags));
    nla_nest_end(message.get(), header);
    return message;
}

// A bit set of 32 bits given by value, replacing the whole set (compact form, no mask).
void PutWordBitset(nl_msg* message, int attribute, std::uint32_t value, std::uint32_t size) {
    nlattr* set = nla_nest_start(message, attribute | NLA_F_NESTED);
    if (!set) throw HostCtlException("cannot build an ethtool request: out of memory");
    Require(nla_put_flag(message, ETHTOOL_A_BITSET_NOMASK));
    Require(nla_put_u32(message, ETHTOOL_A_BITSET_SIZE, size));
    Require(nla_put(message, ETHTOOL_A_BITSET_VALUE, sizeof value, &value));
    nla_nest_end(message, set);
}

}  // namespace

int EthtoolAttributeWidth(std::uint8_t command, int attribute) {
    switch (command) {
        case ETHTOOL_MSG_LINKINFO_SET:
        case ETHTOOL_MSG_PAUSE_SET:
            return 1;
        case ETHTOOL_MSG_LINKMODES_SET:
            return attribute == ETHTOOL_A_LINKMODES_SPEED || attribute == ETHTOOL_A_LINKMODES_LANES ? 4 : 1;
        case ETHTOOL_MSG_COALESCE_SET:
            return attribute == ETHTOOL_A_COALESCE_USE_ADAPTIVE_RX ||
                           attribute == ETHTOOL_A_COALESCE_USE_ADAPTIVE_TX ||
                           attribute == ETHTOOL_A_COALESCE_USE_CQE_MODE_TX ||
                           attribute == ETHTOOL_A_COALESCE_USE_CQE_MODE_RX
                       ? 1
                       : 4;
        case ETHTOOL_MSG_RINGS_SET:
            return attribute == ETHTOOL_A_RINGS_TCP_DATA_SPLIT || attribute == ETHTOOL_A_RINGS_TX_PUSH ? 1
                                                                                                       : 4;
        default:
            return 4;
    }
}

nl_msg* BuildEthtoolGet(int family, std::uint8_t command, const std::string& device, std::uint32_t flags) {
    return Start(family, command, device, flags).release();
}

nl_msg* BuildEthtoolSet(int family, std::uint8_t command, const std::string& device,
                        const std::map<int, std::uint32_t>& values) {
    Message message = Start(family, command, device, 0);
    for (const auto& [attribute, value] : values) {
        if (EthtoolAttributeWidth(command, attribute) == 1) {
            if (value > 0xff)
                throw HostCtlException("cannot build an ethtool request: " + std::to_string(value) +
                                       " does not fit in a byte");
            Require(nla_put_u8(message.get(), attribute, static_cast<std::uint8_t>(value)));
        } else {
            Require(nla_put_u32(message.get(), attribute, value));
        }
    }
    return message.release();
}

nl_msg* BuildEthtoolBitsetSet(int family, std::uint8_t command, const std::string& device, int attribute,
                              std::uint32_t value) {
    Message message = Start(family, command, device, 0);
    PutWordBitset(message.get(), attribute, value, 32);
    return message.release();
}

nl_msg* BuildFeaturesSet(int family, const std::string& device,
                         const std::vector<std::pair<std::string, bool>>& wanted) {
    Message message = Start(family, ETHTOOL_MSG_FEATURES_SET, device, 0);
    nlattr* set = nla_nest_start(message.get(), ETHTOOL_A_FEATURES_WANTED | NLA_F_NESTED);
    nlattr* bits = set ? nla_nest_start(message.get(), ETHTOOL_A_BITSET_BITS | NLA_F_NESTED) : nullptr;
    if (!bits) throw HostCtlException("cannot build an ethtool request: out of memory");
    // Without a NOMASK flag the set is a change: only the bits named are touched.
    for (const auto& [name, on] : wanted) {
        nlattr* bit = nla_nest_start(message.get(), ETHTOOL_A_BITSET_BITS_BIT | NLA_F_NESTED);
        if (!bit) throw HostCtlException("cannot build an ethtool request: out of memory");
        Require(nla_put_string(message.get(), ETHTOOL_A_BITSET_BIT_NAME, name.c_str()));
        if (on) Require(nla_put_flag(message.get(), ETHTOOL_A_BITSET_BIT_VALUE));
        nla_nest_end(message.get(), bit);
    }
    nla_nest_end(message.get(), bits);
    nla_nest_end(message.get(), set);
    return message.release();
}

nl_msg* BuildStatsGet(int family, const std::string& device, const std::vector<std::uint32_t>& groups) {
    Message message = Start(family, ETHTOOL_MSG_STATS_GET, device, 0);
    std::uint32_t mask = 0;
    for (auto group : groups) {
        if (group < 32) mask |= 1u << group;
    }
    PutWordBitset(message.get(), ETHTOOL_A_STATS_GROUPS, mask, __ETHTOOL_STATS_CNT);
    return message.release();
}

// ---------------------------------------------------------------- the family

std::string ParseExtackMessage(nl_msg* message) {
    const nlmsghdr* header = nlmsg_hdr(message);
    if (header->nlmsg_type != NLMSG_ERROR || !(header->nlmsg_flags & NLM_F_ACK_TLVS)) return {};
    if (header->nlmsg_len < NLMSG_HDRLEN + sizeof(nlmsgerr)) return {};
    const auto* error = static_cast<const nlmsgerr*>(nlmsg_data(header));
    std::size_t offset = NLMSG_HDRLEN + sizeof(nlmsgerr);
    // Unless capped, the request follows the error, and the kernel's attributes follow it.
    if (!(header->nlmsg_flags & NLM_F_CAPPED)) {
        if (error->msg.nlmsg_len < NLMSG_HDRLEN) return {};
        offset += error->msg.nlmsg_len - NLMSG_HDRLEN;
    }
    offset = NLMSG_ALIGN(offset);
    if (offset >= header->nlmsg_len) return {};
    const auto* start = reinterpret_cast<const char*>(header) + offset;
    const int length = static_cast<int>(header->nlmsg_len - offset);
    nlattr* attr;
    int rem;
    nla_for_each_attr(attr, reinterpret_cast<nlattr*>(const_cast<char*>(start)), length, rem) {
        if (nla_type(attr) == NLMSGERR_ATTR_MSG && nla_len(attr) > 0) {
            const auto* text = static_cast<const char*>(nla_data(attr));
            return std::string(text, strnlen(text, static_cast<std::size_t>(nla_len(attr))));
        }
    }
    return {};
}

namespace {

struct Exchange {
    const std::function<void(nl_msg*)>* onReply = nullptr;
    int error = 0;
    std::string message;
    bool done = false;
};

int OnValid(nl_msg* message, void* arg) {
    auto& exchange = *static_cast<Exchange*>(arg);
    (*exchange.onReply)(message);
    return NL_OK;
}

int OnAck(nl_msg*, void* arg) {
    static_cast<Exchange*>(arg)->done = true;
    return NL_STOP;
}

int OnError(sockaddr_nl*, nlmsgerr* error, void* arg) {
    auto& exchange = *static_cast<Exchange*>(arg);
    exchange.error = -error->error;
    exchange.done = true;
    // The error sits right after its netlink header; the kernel's message follows it.
    auto* header = reinterpret_cast<nlmsghdr*>(reinterpret_cast<char*>(error) - NLMSG_HDRLEN);
    nl_msg* copy = nlmsg_convert(header);
    if (copy) {
        exchange.message = ParseExtackMessage(copy);
        nlmsg_free(copy);
    }
    return NL_STOP;
}

struct CallbackPut {
    void operator()(nl_cb* cb) const { nl_cb_put(cb); }
};

}  // namespace

void Transact(nl_sock* sock, nl_msg* request, const std::function<void(nl_msg*)>& onReply) {
    Message owned(request);
    // The kernel's own words on a refusal (extended acknowledgements), without the request
    // echoed back.
    const int one = 1;
    setsockopt(nl_socket_get_fd(sock), SOL_NETLINK, NETLINK_EXT_ACK, &one, sizeof one);
    setsockopt(nl_socket_get_fd(sock), SOL_NETLINK, NETLINK_CAP_ACK, &one, sizeof one);
    std::unique_ptr<nl_cb, CallbackPut> cb(nl_cb_alloc(NL_CB_DEFAULT));
    if (!cb) throw HostCtlException("cannot talk to the kernel: out of memory");
    Exchange exchange;
    exchange.onReply = &onReply;
    nl_cb_set(cb.get(), NL_CB_VALID, NL_CB_CUSTOM, OnValid, &exchange);
    nl_cb_set(cb.get(), NL_CB_ACK, NL_CB_CUSTOM, OnAck, &exchange);
    nl_cb_err(cb.get(), NL_CB_CUSTOM, OnError, &exchange);
    nlmsg_hdr(request)->nlmsg_flags |= NLM_F_ACK;
    Check(nl_send_auto(sock, request), "cannot send a request to the kernel");
    while (!exchange.done) {
        const int received = nl_recvmsgs(sock, cb.get());
        if (exchange.error)
            throw EthtoolRefusal(exchange.error, RefusalText(exchange.error, exchange.message));
        if (received < 0) Check(received, "cannot read the kernel's reply");
    }
}

Ethtool::Ethtool(const Namespace& ns) : sock_(Socket(NETLINK_GENERIC, ns)), ns_(ns) {
    // Family numbers are the kernel's, the same in every namespace.
    static int family = 0;
    if (family <= 0) {
        family = genl_ctrl_resolve(sock_, ETHTOOL_GENL_NAME);
        if (family < 0) {
            const int error = family;
            family = 0;
            throw HostCtlException("The kernel has no ethtool netlink interface (Linux 5.6 or later): " +
                                   ErrorText(error));
        }
    }
    family_ = family;
}

std::optional<EthtoolReply> Ethtool::Send(nl_msg* request) {
    std::optional<EthtoolReply> reply;
    Transact(sock_, request, [&](nl_msg* message) {
        if (!reply) reply = ParseEthtoolReply(message);
    });
    return reply;
}

void Ethtool::Set(nl_msg* request) {
    if (DryRun()) {
        Message owned(request);
        const std::string what = DescribeEthtoolRequest(request);
        return Record(
            what.empty() ? "ethtool request " + std::to_string(nlmsg_hdr(request)->nlmsg_type) : what, ns_);
    }
    Send(request);
}

EthtoolReply Ethtool::Get(std::uint8_t command, const std::string& device, std::uint32_t flags) {
    auto reply = Send(BuildEthtoolGet(family_, command, device, flags));
    if (!reply) throw EthtoolRefusal(EPROTO, "the kernel sent no reply");
    return std::move(*reply);
}

// ---------------------------------------------------------------- the ioctl

std::string FixedText(const char* field, std::size_t size) {
    return std::string(field, strnlen(field, size));
}

std::vector<std::string> ParseStringSet(const std::uint8_t* data, std::size_t count) {
    std::vector<std::string> strings;
    strings.reserve(count);
    for (std::size_t i = 0; i < count; ++i)
        strings.push_back(
            FixedText(reinterpret_cast<const char*>(data) + i * ETH_GSTRING_LEN, ETH_GSTRING_LEN));
    return strings;
}

std::vector<std::string> SelfTestLines(const std::vector<std::string>& names,
                                       const std::vector<std::uint64_t>& results) {
    std::vector<std::string> lines;
    for (std::size_t i = 0; i < results.size(); ++i) {
        std::string name = i < names.size() ? names[i] : std::string();
        while (!name.empty() && name.back() == ' ')
            name.pop_back();
        if (name.empty()) name = "Test " + std::to_string(i + 1);
        lines.push_back(name + ": " + std::to_string(results[i]));
    }
    return lines;
}

namespace {

// Closes a descriptor when it leaves scope.
struct Descriptor {
    int fd = -1;
    ~Descriptor() {
        if (fd >= 0) close(fd);
    }
};

// SIOCETHTOOL on a device with its command structure; throws the driver's refusal.
void Ioctl(const std::string& device, void* command) {
    if (device.empty() || device.size() >= IFNAMSIZ) throw EthtoolRefusal(ENODEV, std::strerror(ENODEV));
    Descriptor sock;
    sock.fd = socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    // A kernel without IPv4 still answers on a generic netlink socket.
    if (sock.fd < 0) sock.fd = socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, NETLINK_GENERIC);
    if (sock.fd < 0) throw EthtoolRefusal(errno, std::strerror(errno));
    ifreq request{};
    std::memcpy(request.ifr_name, device.c_str(), device.size());
    request.ifr_data = static_cast<char*>(command);
    if (ioctl(sock.fd, SIOCETHTOOL, &request) < 0) {
        const int error = errno;
        throw EthtoolRefusal(error, RefusalText(error, {}));
    }
}

// A command structure followed by its variable part, zeroed, in one aligned buffer.
template <class T>
class Variable {
public:
    explicit Variable(std::size_t extra) : words_((sizeof(T) + extra + 7) / 8) {}
    T* operator->() { return reinterpret_cast<T*>(words_.data()); }
    T* get() { return reinterpret_cast<T*>(words_.data()); }

private:
    std::vector<std::uint64_t> words_;
};

}  // namespace

DriverInfo ReadDriverInfo(const std::string& device) {
    ethtool_drvinfo info{};
    info.cmd = ETHTOOL_GDRVINFO;
    Ioctl(device, &info);
    DriverInfo out;
    out.driver = FixedText(info.driver, sizeof info.driver);
    out.version = FixedText(info.version, sizeof info.version);
    out.firmwareVersion = FixedText(info.fw_version, sizeof info.fw_version);
    out.busInfo = FixedText(info.bus_info, sizeof info.bus_info);
    out.statsCount = info.n_stats;
    out.testCount = info.testinfo_len;
    out.eepromLength = info.eedump_len;
    out.registersLength = info.regdump_len;
    return out;
}

std::optional<std::string> ReadPermanentAddress(const std::string& device) {
    constexpr std::uint32_t kMaxAddress = 32;  // MAX_ADDR_LEN
    Variable<ethtool_perm_addr> address(kMaxAddress);
    address->cmd = ETHTOOL_GPERMADDR;
    address->size = kMaxAddress;
    Ioctl(device, address.get());
    const std::uint32_t size = std::min(address->size, kMaxAddress);
    bool any = false;
    std::string text;
    for (std::uint32_t i = 0; i < size; ++i) {
        char byte[4];
        std::snprintf(byte, sizeof byte, "%02x", address->data[i]);
        text += (i ? ":" : "") + std::string(byte);
        any = any || address->data[i] != 0;
    }
    if (!any) return std::nullopt;
    return text;
}

std::vector<std::uint8_t> ReadRegisters(const std::string& device, std::uint32_t length) {
    Variable<ethtool_regs> regs(length);
    regs->cmd = ETHTOOL_GREGS;
    regs->len = length;
    Ioctl(device, regs.get());
    const std::uint32_t got = std::min(regs->len, length);
    return std::vector<std::uint8_t>(regs->data, regs->data + got);
}

std::vector<std::uint8_t> ReadEeprom(const std::string& device, std::uint32_t offset, std::uint32_t length) {
    Variable<ethtool_eeprom> eeprom(length);
    eeprom->cmd = ETHTOOL_GEEPROM;
    eeprom->offset = offset;
    eeprom->len = length;
    Ioctl(device, eeprom.get());
    const std::uint32_t got = std::min(eeprom->len, length);
    return std::vector<std::uint8_t>(eeprom->data, eeprom->data + got);
}

void WriteEeprom(const std::string& device, std::uint32_t magic, std::uint32_t offset,
                 const std::vector<std::uint8_t>& bytes) {
    if (DryRun()) {
        char text[16];
        std::snprintf(text, sizeof text, "0x%x", magic);
        return Record("ethtool eeprom write " + device + " magic " + text + " offset " +
                          std::to_string(offset) + " length " + std::to_string(bytes.size()),
                      Namespace::Own());
    }
    Variable<ethtool_eeprom> eeprom(bytes.size());
    eeprom->cmd = ETHTOOL_SEEPROM;
    eeprom->magic = magic;
    eeprom->offset = offset;
    eeprom->len = static_cast<std::uint32_t>(bytes.size());
    if (!bytes.empty()) std::memcpy(eeprom->data, bytes.data(), bytes.size());
    Ioctl(device, eeprom.get());
}

SelfTest RunSelfTest(const std::string& device, bool online, std::uint32_t testCount) {
    if (DryRun()) {
        Record("ethtool selftest " + device + (online ? " online" : " offline"), Namespace::Own());
        return {};
    }
    Variable<ethtool_test> test(testCount * sizeof(std::uint64_t));
    test->cmd = ETHTOOL_TEST;
    test->flags = online ? 0 : ETH_TEST_FL_OFFLINE;
    test->len = testCount;
    Ioctl(device, test.get());
    std::vector<std::uint64_t> results(test->data, test->data + std::min(test->len, testCount));

    std::vector<std::string> names;
    if (!results.empty()) {
        Variable<ethtool_gstrings> strings(results.size() * ETH_GSTRING_LEN);
        strings->cmd = ETHTOOL_GSTRINGS;
        strings->string_set = ETH_SS_TEST;
        strings->len = static_cast<std::uint32_t>(results.size());
        Ioctl(device, strings.get());
        names = ParseStringSet(strings->data, std::min<std::size_t>(strings->len, results.size()));
    }
    SelfTest out;
    out.failed = test->flags & ETH_TEST_FL_FAILED;
    out.lines = SelfTestLines(names, results);
    return out;
}

void RestartNegotiation(const std::string& device) {
    if (DryRun()) return Record("ethtool autoneg restart " + device, Namespace::Own());
    ethtool_value value{};
    value.cmd = ETHTOOL_NWAY_RST;
    Ioctl(device, &value);
}

std::vector<std::uint32_t> ReadRssTable(const std::string& device) {
    ethtool_rxfh_indir size{};
    size.cmd = ETHTOOL_GRXFHINDIR;
    Ioctl(device, &size);
    if (size.size == 0) return {};
    Variable<ethtool_rxfh_indir> table(size.size * sizeof(std::uint32_t));
    table->cmd = ETHTOOL_GRXFHINDIR;
    table->size = size.size;
    Ioctl(device, table.get());
    return std::vector<std::uint32_t>(table->ring_index,
                                      table->ring_index + std::min(table->size, size.size));
}

void WriteRssTable(const std::string& device, const std::vector<std::uint32_t>& table) {
    if (DryRun()) {
        std::set<std::uint32_t> queues(table.begin(), table.end());
        std::string text;
        for (auto queue : queues)
            text += " " + std::to_string(queue);
        return Record(
            "ethtool rss set " + device +
                (table.empty() ? std::string(" default")
                               : " table of " + std::to_string(table.size()) + " entries to queues" + text),
            Namespace::Own());
    }
    Variable<ethtool_rxfh_indir> indir(table.size() * sizeof(std::uint32_t));
    indir->cmd = ETHTOOL_SRXFHINDIR;
    indir->size = static_cast<std::uint32_t>(table.size());
    if (!table.empty()) std::memcpy(indir->ring_index, table.data(), table.size() * sizeof(std::uint32_t));
    Ioctl(device, indir.get());
}

}  // namespace TknCtl::Linux::Kernel
