#include "kernel/xfrm.h"

#include <arpa/inet.h>
#include <linux/netlink.h>
#include <linux/xfrm.h>
#include <netlink/attr.h>
#include <netlink/cache.h>
#include <netlink/msg.h>
#include <netlink/netlink.h>
#include <netlink/socket.h>
#include <netlink/xfrm/lifetime.h>
#include <netlink/xfrm/sa.h>
#include <netlink/xfrm/selector.h>
#include <netlink/xfrm/sp.h>
#include <netlink/xfrm/template.h>
#include <sys/socket.h>

#include <cerrno>
#include <cstring>
#include <memory>

#include "hostctl/exception.h"
#include "kernel/describe.h"
#include "kernel/dryrun.h"

#ifndef SOL_NETLINK
#define SOL_NETLINK 270
#endif

namespace TknCtl::Linux::Kernel {

using HostCtl::Lib::HostCtlException;

namespace {

struct CacheFree {
    void operator()(nl_cache* cache) const { nl_cache_free(cache); }
};
struct MsgFree {
    void operator()(nl_msg* msg) const { nlmsg_free(msg); }
};
struct AddrPut {
    void operator()(nl_addr* addr) const { nl_addr_put(addr); }
};
struct SaPut {
    void operator()(xfrmnl_sa* sa) const { xfrmnl_sa_put(sa); }
};
struct SpPut {
    void operator()(xfrmnl_sp* sp) const { xfrmnl_sp_put(sp); }
};
struct SelPut {
    void operator()(xfrmnl_sel* sel) const { xfrmnl_sel_put(sel); }
};
struct LifetimePut {
    void operator()(xfrmnl_ltime_cfg* cfg) const { xfrmnl_ltime_cfg_put(cfg); }
};
struct CbPut {
    void operator()(nl_cb* cb) const { nl_cb_put(cb); }
};
using Cache = std::unique_ptr<nl_cache, CacheFree>;
using Msg = std::unique_ptr<nl_msg, MsgFree>;
using Addr = std::unique_ptr<nl_addr, AddrPut>;

constexpr int kXfrmProtocol = 6;  // NETLINK_XFRM

void OutOfMemory(void* pointer) {
    if (!pointer) throw HostCtlException("out of memory");
}

// An address of a family as libnl holds it; the prefix length is the whole address unless given.
Addr MakeAddress(int family, const std::string& text, int prefix = -1) {
    unsigned char bytes[16] = {};
    if (inet_pton(family == kXfrmInet6 ? AF_INET6 : AF_INET, text.c_str(), bytes) != 1)
        throw HostCtlException("Invalid " + std::string(family == kXfrmInet6 ? "IPv6" : "IPv4") +
                               " address " + text);
    const unsigned length = family == kXfrmInet6 ? 16 : 4;
    Addr addr(nl_addr_build(family, bytes, length));
    OutOfMemory(addr.get());
    nl_addr_set_prefixlen(addr.get(), prefix < 0 ? static_cast<int>(length * 8) : prefix);
    return addr;
}

std::string AddressText(nl_addr* addr, int family) {
    if (!addr || nl_addr_get_len(addr) == 0) return family == kXfrmInet ? "0.0.0.0" : "::";
    char text[INET6_ADDRSTRLEN] = {};
    int af = nl_addr_get_family(addr);
    if (af != AF_INET && af != AF_INET6) af = nl_addr_get_len(addr) == 16 ? AF_INET6 : AF_INET;
    inet_ntop(af, nl_addr_get_binary_addr(addr), text, sizeof(text));
    return text;
}

xfrmnl_ltime_cfg* UnlimitedLifetime(std::uint64_t hardAddSeconds) {
    xfrmnl_ltime_cfg* cfg = xfrmnl_ltime_cfg_alloc();
    OutOfMemory(cfg);
    xfrmnl_ltime_cfg_set_soft_bytelimit(cfg, XFRM_INF);
    xfrmnl_ltime_cfg_set_hard_bytelimit(cfg, XFRM_INF);
    xfrmnl_ltime_cfg_set_soft_packetlimit(cfg, XFRM_INF);
    xfrmnl_ltime_cfg_set_hard_packetlimit(cfg, XFRM_INF);
    xfrmnl_ltime_cfg_set_hard_addexpires(cfg, hardAddSeconds);
    return cfg;
}

// The kernel's words in an error acknowledgement (NLMSGERR_ATTR_MSG), when it gave them.
std::string ExtendedAckMessage(const nlmsgerr* error) {
    const auto* header =
        reinterpret_cast<const nlmsghdr*>(reinterpret_cast<const char*>(error) - NLMSG_HDRLEN);
    if (!(header->nlmsg_flags & NLM_F_ACK_TLVS)) return {};
    std::size_t payload = sizeof(nlmsgerr);
    if (!(header->nlmsg_flags & NLM_F_CAPPED) && error->msg.nlmsg_len >= NLMSG_HDRLEN)
        payload += error->msg.nlmsg_len - NLMSG_HDRLEN;
    std::size_t start = NLMSG_HDRLEN + NLMSG_ALIGN(payload);
    if (start >= header->nlmsg_len) return {};
    const auto* head = reinterpret_cast<const nlattr*>(reinterpret_cast<const char*>(header) + start);
    const nlattr* message = nla_find(head, static_cast<int>(header->nlmsg_len - start), NLMSGERR_ATTR_MSG);
    if (!message || nla_len(message) <= 0) return {};
    const char* text = static_cast<const char*>(nla_data(message));
    return std::string(text, strnlen(text, static_cast<std::size_t>(nla_len(message))));
}

struct Outcome {
    bool answered = false;
    XfrmRefusal refusal;
};

int OnError(sockaddr_nl*, nlmsgerr* error, void* arg) {
    auto* outcome = static_cast<Outcome*>(arg);
    outcome->answered = true;
    outcome->refusal.error = -error->error;
    outcome->refusal.message = ExtendedAckMessage(error);
    return NL_STOP;
}

int OnAck(nl_msg*, void* arg) {
    static_cast<Outcome*>(arg)->answered = true;
    return NL_STOP;
}

// "cannot read ...": the kernel shows xfrm only to CAP_NET_ADMIN.
void CheckRead(int nlError, const std::string& what) {
    if (nlError == -NLE_PERM)
        throw HostCtlException(what + ": the kernel shows them only to root (CAP_NET_ADMIN)");
    Check(nlError, what);
}

}  // namespace

// ---------------------------------------------------------------- algorithms and keys

namespace {

struct AlgorithmName {
    const char* name;     // of the commands
    const char* kernel;   // of the crypto API
    unsigned keyBits;     // 0: any
    unsigned truncation;  // integrity: ICV bits
};

constexpr AlgorithmName kEncryption[] = {
    {"null", "ecb(cipher_null)", 0, 0},
    {"3des-cbc", "cbc(des3_ede)", 192, 0},
    {"aes128-cbc", "cbc(aes)", 128, 0},
};
constexpr AlgorithmName kIntegrity[] = {
    {"hmac-sha1", "hmac(sha1)", 160, 96},
    {"hmac-sha2-256", "hmac(sha256)", 256, 128},
};

template <std::size_t N>
std::optional<XfrmAlgorithm> ByName(const AlgorithmName (&table)[N], const std::string& name) {
    for (const auto& entry : table) {
        if (name == entry.name) return XfrmAlgorithm{entry.kernel, entry.keyBits, entry.truncation, {}};
    }
    return std::nullopt;
}

}  // namespace

std::optional<XfrmAlgorithm> EncryptionByName(const std::string& name) {
    return ByName(kEncryption, name);
}

std::optional<XfrmAlgorithm> IntegrityByName(const std::string& name) {
    return ByName(kIntegrity, name);
}

std::string EncryptionName(const XfrmAlgorithm& algorithm) {
    if (algorithm.name == "ecb(cipher_null)" || algorithm.name == "cipher_null") return "null";
    if (algorithm.name == "cbc(des3_ede)" && algorithm.keyBits == 192) return "3des-cbc";
    if (algorithm.name == "cbc(aes)" && algorithm.keyBits == 128) return "aes128-cbc";
    return {};
}

std::string IntegrityName(const XfrmAlgorithm& algorithm) {
    // A truncation other than the standard one is another algorithm for the peer.
    for (const auto& entry : kIntegrity) {
        if (algorithm.name == entry.kernel &&
            (algorithm.truncationBits == entry.truncation || algorithm.truncationBits == 0))
            return entry.name;
    }
    return {};
}

std::string KeyBytes(const std::string& text) {
    if (text.size() >= 2 && text[0] == '0' && (text[1] == 'x' || text[1] == 'X')) {
        std::string bytes;
        std::string digits = text.substr(2);
        if (digits.size() % 2 != 0) throw HostCtlException("A hex key needs an even number of digits");
        for (std::size_t i = 0; i < digits.size(); i += 2) {
            auto nibble = [&](char c) -> int {
                if (c >= '0' && c <= '9') return c - '0';
                if (c >= 'a' && c <= 'f') return c - 'a' + 10;
                if (c >= 'A' && c <= 'F') return c - 'A' + 10;
                throw HostCtlException("A hex key holds only hexadecimal digits after 0x");
            };
            bytes += static_cast<char>(nibble(digits[i]) * 16 + nibble(digits[i + 1]));
        }
        return bytes;
    }
    return text;
}

// ---------------------------------------------------------------- states

XfrmState StateFromObject(xfrmnl_sa* object) {
    XfrmState state;
    state.family = xfrmnl_sa_get_family(object);
    state.destination = AddressText(xfrmnl_sa_get_daddr(object), state.family);
    state.source = AddressText(xfrmnl_sa_get_saddr(object), state.family);
    state.spi = static_cast<std::uint32_t>(xfrmnl_sa_get_spi(object));
    state.protocol = xfrmnl_sa_get_proto(object);
    state.mode = xfrmnl_sa_get_mode(object);
    int reqid = xfrmnl_sa_get_reqid(object);
    state.reqid = reqid < 0 ? 0 : static_cast<std::uint32_t>(reqid);
    if (xfrmnl_ltime_cfg* lifetime = xfrmnl_sa_get_lifetime_cfg(object))
        state.lifetimeSeconds = xfrmnl_ltime_cfg_get_hard_addexpires(lifetime);
    // The names only: the keys stay where they are.
    char name[64] = {};
    unsigned keyBits = 0;
    unsigned truncation = 0;
    if (xfrmnl_sa_get_crypto_params(object, name, &keyBits, nullptr) == 0)
        state.encryption = XfrmAlgorithm{name, keyBits, 0, {}};
    std::memset(name, 0, sizeof(name));
    if (xfrmnl_sa_get_auth_params(object, name, &keyBits, &truncation, nullptr) == 0)
        state.integrity = XfrmAlgorithm{name, keyBits, truncation, {}};
    return state;
}

std::optional<XfrmState> ParseState(nl_msg* message) {
    nlmsghdr* header = nlmsg_hdr(message);
    if (header->nlmsg_type != XFRM_MSG_NEWSA) return std::nullopt;
    xfrmnl_sa* object = nullptr;
    if (xfrmnl_sa_parse(header, &object) < 0 || !object) return std::nullopt;
    std::unique_ptr<xfrmnl_sa, SaPut> owned(object);
    return StateFromObject(object);
}

std::vector<XfrmState> ListStates(const Namespace& ns) {
    nl_cache* raw = nullptr;
    CheckRead(xfrmnl_sa_alloc_cache(Socket(kXfrmProtocol, ns), &raw),
              "Cannot read the kernel's IPsec states");
    Cache cache(raw);
    std::vector<XfrmState> states;
    for (nl_object* object = nl_cache_get_first(raw); object; object = nl_cache_get_next(object))
        states.push_back(StateFromObject(reinterpret_cast<xfrmnl_sa*>(object)));
    if (DryRun()) ApplyXfrmPlans(ns, states);
    return states;
}

nl_msg* BuildStateAdd(const XfrmState& state) {
    std::unique_ptr<xfrmnl_sa, SaPut> sa(xfrmnl_sa_alloc());
    OutOfMemory(sa.get());
    xfrmnl_sa_set_family(sa.get(), static_cast<unsigned>(state.family));
    xfrmnl_sa_set_daddr(sa.get(), MakeAddress(state.family, state.destination).get());
    xfrmnl_sa_set_saddr(sa.get(), MakeAddress(state.family, state.source).get());
    xfrmnl_sa_set_spi(sa.get(), state.spi);
    xfrmnl_sa_set_proto(sa.get(), static_cast<unsigned>(state.protocol));
    xfrmnl_sa_set_mode(sa.get(), static_cast<unsigned>(state.mode));
    xfrmnl_sa_set_reqid(sa.get(), state.reqid);
    // Anti-replay over the last 32 packets.
    xfrmnl_sa_set_replay_window(sa.get(), 32);
    std::unique_ptr<xfrmnl_ltime_cfg, LifetimePut> lifetime(UnlimitedLifetime(state.lifetimeSeconds));
    xfrmnl_sa_set_lifetime_cfg(sa.get(), lifetime.get());
    auto keyFits = [](const XfrmAlgorithm& algorithm) {
        if ((algorithm.keyBits + 7) / 8 != algorithm.key.size() || algorithm.name.size() >= 64)
            throw HostCtlException("The key of " + algorithm.name + " does not have " +
                                   std::to_string(algorithm.keyBits) + " bits");
    };
    if (state.encryption) {
        keyFits(*state.encryption);
        if (xfrmnl_sa_set_crypto_params(sa.get(), state.encryption->name.c_str(), state.encryption->keyBits,
                                        state.encryption->key.data()) < 0)
            throw HostCtlException("cannot build an IPsec state with " + state.encryption->name);
    }
    if (state.integrity) {
        keyFits(*state.integrity);
        if (xfrmnl_sa_set_auth_params(sa.get(), state.integrity->name.c_str(), state.integrity->keyBits,
                                      state.integrity->truncationBits, state.integrity->key.data()) < 0)
            throw HostCtlException("cannot build an IPsec state with " + state.integrity->name);
    }
    nl_msg* message = nullptr;
    Check(xfrmnl_sa_build_add_request(sa.get(), NLM_F_CREATE | NLM_F_EXCL, &message),
          "cannot build a request to add an IPsec state");
    return message;
}

nl_msg* BuildStateDelete(const XfrmState& state) {
    std::unique_ptr<xfrmnl_sa, SaPut> sa(xfrmnl_sa_alloc());
    OutOfMemory(sa.get());
    xfrmnl_sa_set_daddr(sa.get(), MakeAddress(state.family, state.destination).get());
    xfrmnl_sa_set_spi(sa.get(), state.spi);
    xfrmnl_sa_set_proto(sa.get(), static_cast<unsigned>(state.protocol));
    nl_msg* message = nullptr;
    Check(xfrmnl_sa_build_delete_request(sa.get(), 0, &message),
          "cannot build a request to delete an IPsec state");
    return message;
}

// ---------------------------------------------------------------- policies

XfrmPolicy PolicyFromObject(xfrmnl_sp* object) {
    XfrmPolicy policy;
    if (xfrmnl_sel* sel = xfrmnl_sp_get_sel(object)) {
        auto& s = policy.selector;
        s.family = xfrmnl_sel_get_family(sel);
        s.source = AddressText(xfrmnl_sel_get_saddr(sel), s.family);
        s.destination = AddressText(xfrmnl_sel_get_daddr(sel), s.family);
        s.sourcePrefix = static_cast<unsigned>(xfrmnl_sel_get_prefixlen_s(sel));
        s.destinationPrefix = static_cast<unsigned>(xfrmnl_sel_get_prefixlen_d(sel));
        // A port counts where the selector's mask covers it.
        s.sourcePort =
            xfrmnl_sel_get_sportmask(sel) ? static_cast<std::uint16_t>(xfrmnl_sel_get_sport(sel)) : 0;
        s.destinationPort =
            xfrmnl_sel_get_dportmask(sel) ? static_cast<std::uint16_t>(xfrmnl_sel_get_dport(sel)) : 0;
        s.protocol = xfrmnl_sel_get_proto(sel);
    }
    policy.direction = xfrmnl_sp_get_dir(object);
    policy.action = xfrmnl_sp_get_action(object);
    policy.index = static_cast<std::uint32_t>(xfrmnl_sp_get_index(object));
    policy.priority = static_cast<std::uint32_t>(xfrmnl_sp_get_priority(object));
    int type = xfrmnl_sp_get_userpolicy_type(object);
    policy.mainType = type <= 0 || type == XFRM_POLICY_TYPE_MAIN;
    const int count = xfrmnl_sp_get_nusertemplates(object);
    for (int i = 0; i < count; ++i) {
        xfrmnl_user_tmpl* t = xfrmnl_sp_usertemplate_n(object, i);
        if (!t) continue;
        XfrmTemplate tmpl;
        tmpl.family = xfrmnl_user_tmpl_get_family(t);
        tmpl.source = AddressText(xfrmnl_user_tmpl_get_saddr(t), tmpl.family);
        tmpl.destination = AddressText(xfrmnl_user_tmpl_get_daddr(t), tmpl.family);
        tmpl.spi = static_cast<std::uint32_t>(xfrmnl_user_tmpl_get_spi(t));
        tmpl.protocol = xfrmnl_user_tmpl_get_proto(t);
        tmpl.mode = xfrmnl_user_tmpl_get_mode(t);
        policy.templates.push_back(tmpl);
    }
    return policy;
}

std::optional<XfrmPolicy> ParsePolicy(nl_msg* message) {
    nlmsghdr* header = nlmsg_hdr(message);
    if (header->nlmsg_type != XFRM_MSG_NEWPOLICY) return std::nullopt;
    xfrmnl_sp* object = nullptr;
    if (xfrmnl_sp_parse(header, &object) < 0 || !object) return std::nullopt;
    std::unique_ptr<xfrmnl_sp, SpPut> owned(object);
    return PolicyFromObject(object);
}

std::vector<XfrmPolicy> ListPolicies(const Namespace& ns) {
    nl_cache* raw = nullptr;
    CheckRead(xfrmnl_sp_alloc_cache(Socket(kXfrmProtocol, ns), &raw),
              "Cannot read the kernel's IPsec policies");
    Cache cache(raw);
    std::vector<XfrmPolicy> policies;
    for (nl_object* object = nl_cache_get_first(raw); object; object = nl_cache_get_next(object))
        policies.push_back(PolicyFromObject(reinterpret_cast<xfrmnl_sp*>(object)));
    if (DryRun()) ApplyXfrmPlans(ns, policies);
    return policies;
}

nl_msg* BuildPolicyAdd(const XfrmPolicy& policy) {
    const auto& s = policy.selector;
    const unsigned bits = s.family == kXfrmInet6 ? 128 : 32;
    if (s.sourcePrefix > bits || s.destinationPrefix > bits)
        throw HostCtlException("A prefix length is longer than the address");
    std::unique_ptr<xfrmnl_sel, SelPut> sel(xfrmnl_sel_alloc());
    OutOfMemory(sel.get());
    xfrmnl_sel_set_family(sel.get(), static_cast<unsigned>(s.family));
    xfrmnl_sel_set_saddr(sel.get(), MakeAddress(s.family, s.source, static_cast<int>(s.sourcePrefix)).get());
    xfrmnl_sel_set_daddr(sel.get(),
                         MakeAddress(s.family, s.destination, static_cast<int>(s.destinationPrefix)).get());
    xfrmnl_sel_set_prefixlen_s(sel.get(), s.sourcePrefix);
    xfrmnl_sel_set_prefixlen_d(sel.get(), s.destinationPrefix);
    xfrmnl_sel_set_sport(sel.get(), s.sourcePort);
    xfrmnl_sel_set_sportmask(sel.get(), s.sourcePort ? 0xffff : 0);
    xfrmnl_sel_set_dport(sel.get(), s.destinationPort);
    xfrmnl_sel_set_dportmask(sel.get(), s.destinationPort ? 0xffff : 0);
    xfrmnl_sel_set_proto(sel.get(), static_cast<unsigned>(s.protocol));

    std::unique_ptr<xfrmnl_sp, SpPut> sp(xfrmnl_sp_alloc());
    OutOfMemory(sp.get());
    xfrmnl_sp_set_sel(sp.get(), sel.get());
    std::unique_ptr<xfrmnl_ltime_cfg, LifetimePut> lifetime(UnlimitedLifetime(0));
    xfrmnl_sp_set_lifetime_cfg(sp.get(), lifetime.get());
    xfrmnl_sp_set_dir(sp.get(), static_cast<unsigned>(policy.direction));
    xfrmnl_sp_set_action(sp.get(), static_cast<unsigned>(policy.action));
    xfrmnl_sp_set_priority(sp.get(), policy.priority);
    for (const auto& tmpl : policy.templates) {
        xfrmnl_user_tmpl* t = xfrmnl_user_tmpl_alloc();
        OutOfMemory(t);
        // The policy owns the template from here on.
        xfrmnl_sp_add_usertemplate(sp.get(), t);
        xfrmnl_user_tmpl_set_family(t, static_cast<unsigned>(tmpl.family));
        xfrmnl_user_tmpl_set_saddr(t, MakeAddress(tmpl.family, tmpl.source).get());
        xfrmnl_user_tmpl_set_daddr(t, MakeAddress(tmpl.family, tmpl.destination).get());
        xfrmnl_user_tmpl_set_spi(t, tmpl.spi);
        xfrmnl_user_tmpl_set_proto(t, static_cast<unsigned>(tmpl.protocol));
        xfrmnl_user_tmpl_set_mode(t, static_cast<unsigned>(tmpl.mode));
        // Any algorithm the state has will do.
        xfrmnl_user_tmpl_set_aalgos(t, ~0u);
        xfrmnl_user_tmpl_set_ealgos(t, ~0u);
        xfrmnl_user_tmpl_set_calgos(t, ~0u);
    }
    nl_msg* message = nullptr;
    Check(xfrmnl_sp_build_add_request(sp.get(), NLM_F_CREATE | NLM_F_EXCL, &message),
          "cannot build a request to add an IPsec policy");
    return message;
}

nl_msg* BuildPolicyDelete(const XfrmPolicy& policy) {
    std::unique_ptr<xfrmnl_sp, SpPut> sp(xfrmnl_sp_alloc());
    OutOfMemory(sp.get());
    xfrmnl_sp_set_index(sp.get(), policy.index);
    xfrmnl_sp_set_dir(sp.get(), static_cast<unsigned>(policy.direction));
    nl_msg* message = nullptr;
    Check(xfrmnl_sp_build_delete_request(sp.get(), 0, &message),
          "cannot build a request to delete an IPsec policy");
    return message;
}

// ---------------------------------------------------------------- requests

std::optional<XfrmRefusal> Send(const Namespace& ns, nl_msg* request) {
    Msg owned(request);
    if (DryRun()) {
        const std::string what = DescribeXfrmRequest(request);
        Record(what.empty() ? "xfrm request of type " + std::to_string(nlmsg_hdr(request)->nlmsg_type) : what,
               ns);
        PlanXfrmRequest(ns, request);
        return std::nullopt;
    }
    nl_sock* sock = Socket(kXfrmProtocol, ns);
    // The kernel's own words with a refusal ("Requested type not found").
    int one = 1;
    setsockopt(nl_socket_get_fd(sock), SOL_NETLINK, NETLINK_EXT_ACK, &one, sizeof(one));
    std::unique_ptr<nl_cb, CbPut> base(nl_socket_get_cb(sock));
    std::unique_ptr<nl_cb, CbPut> cb(nl_cb_clone(base.get()));
    OutOfMemory(cb.get());
    Outcome outcome;
    nl_cb_err(cb.get(), NL_CB_CUSTOM, OnError, &outcome);
    nl_cb_set(cb.get(), NL_CB_ACK, NL_CB_CUSTOM, OnAck, &outcome);
    Check(nl_send_auto(sock, request), "cannot send a request to the kernel's IPsec");
    while (!outcome.answered) {
        int error = nl_recvmsgs(sock, cb.get());
        if (error < 0 && !outcome.answered)
            return XfrmRefusal{EIO, "no answer from the kernel: " + ErrorText(error)};
    }
    if (outcome.refusal.error == 0) return std::nullopt;
    return outcome.refusal;
}

}  // namespace TknCtl::Linux::Kernel
