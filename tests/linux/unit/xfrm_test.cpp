// IPsec requests and replies of the xfrm layer, built and read in memory: this kernel has no
// ESP, so the states are tested here only.
#include <arpa/inet.h>
#include <gtest/gtest.h>
#include <linux/xfrm.h>
#include <netlink/attr.h>
#include <netlink/msg.h>

#include <cstring>
#include <memory>

#include "hostctl/exception.h"
#include "kernel/xfrm.h"

namespace {

namespace K = TknCtl::Linux::Kernel;
using HostCtl::Lib::HostCtlException;

struct MsgFree {
    void operator()(nl_msg* msg) const { nlmsg_free(msg); }
};
using Msg = std::unique_ptr<nl_msg, MsgFree>;

const std::string kAesKey = "0123456789abcdef";
const std::string kShaKey = "0123456789abcdefghij";

K::XfrmState AesState() {
    K::XfrmState state;
    state.source = "2001:db8::1";
    state.destination = "2001:db8::2";
    state.spi = 0x1234;
    state.mode = K::kXfrmTunnel;
    state.lifetimeSeconds = 3600;
    state.encryption = K::EncryptionByName("aes128-cbc");
    state.encryption->key = kAesKey;
    state.integrity = K::IntegrityByName("hmac-sha1");
    state.integrity->key = kShaKey;
    return state;
}

// The attribute of a request, found after its fixed header.
const nlattr* Attribute(nl_msg* msg, std::size_t fixed, int type) {
    return nlmsg_find_attr(nlmsg_hdr(msg), static_cast<int>(fixed), type);
}

TEST(XfrmState, AnAddRequestCarriesTheStateAndItsKeysAndReadsBackWithoutThem) {
    Msg msg(K::BuildStateAdd(AesState()));
    nlmsghdr* header = nlmsg_hdr(msg.get());
    EXPECT_EQ(header->nlmsg_type, XFRM_MSG_NEWSA);
    EXPECT_EQ(header->nlmsg_flags & (NLM_F_CREATE | NLM_F_EXCL), NLM_F_CREATE | NLM_F_EXCL);
    const auto* info = static_cast<const xfrm_usersa_info*>(nlmsg_data(header));
    EXPECT_EQ(ntohl(info->id.spi), 0x1234u);
    EXPECT_EQ(info->id.proto, IPPROTO_ESP);
    EXPECT_EQ(info->family, AF_INET6);
    EXPECT_EQ(info->mode, XFRM_MODE_TUNNEL);
    EXPECT_EQ(info->replay_window, 32);
    // Never expires by traffic, only after its lifetime.
    EXPECT_EQ(info->lft.hard_byte_limit, XFRM_INF);
    EXPECT_EQ(info->lft.hard_packet_limit, XFRM_INF);
    EXPECT_EQ(info->lft.hard_add_expires_seconds, 3600u);

    const nlattr* crypt = Attribute(msg.get(), sizeof(xfrm_usersa_info), XFRMA_ALG_CRYPT);
    ASSERT_NE(crypt, nullptr);
    const auto* algo = static_cast<const xfrm_algo*>(nla_data(crypt));
    EXPECT_STREQ(algo->alg_name, "cbc(aes)");
    EXPECT_EQ(algo->alg_key_len, 128u);
    EXPECT_EQ(std::string(algo->alg_key, algo->alg_key + 16), kAesKey);
    const nlattr* auth = Attribute(msg.get(), sizeof(xfrm_usersa_info), XFRMA_ALG_AUTH_TRUNC);
    ASSERT_NE(auth, nullptr);
    const auto* trunc = static_cast<const xfrm_algo_auth*>(nla_data(auth));
    EXPECT_STREQ(trunc->alg_name, "hmac(sha1)");
    EXPECT_EQ(trunc->alg_trunc_len, 96u);

    auto parsed = K::ParseState(msg.get());
    ASSERT_TRUE(parsed);
    EXPECT_EQ(parsed->source, "2001:db8::1");
    EXPECT_EQ(parsed->destination, "2001:db8::2");
    EXPECT_EQ(parsed->spi, 0x1234u);
    EXPECT_EQ(parsed->mode, K::kXfrmTunnel);
    EXPECT_EQ(parsed->lifetimeSeconds, 3600u);
    ASSERT_TRUE(parsed->encryption && parsed->integrity);
    EXPECT_EQ(K::EncryptionName(*parsed->encryption), "aes128-cbc");
    EXPECT_EQ(K::IntegrityName(*parsed->integrity), "hmac-sha1");
    EXPECT_TRUE(parsed->encryption->key.empty());
    EXPECT_TRUE(parsed->integrity->key.empty());
}

TEST(XfrmState, NullEncryptionAndTheDeleteRequest) {
    K::XfrmState state = AesState();
    state.encryption = K::EncryptionByName("null");
    state.source = "::";
    Msg add(K::BuildStateAdd(state));
    auto parsed = K::ParseState(add.get());
    ASSERT_TRUE(parsed && parsed->encryption);
    EXPECT_EQ(parsed->source, "::");
    EXPECT_EQ(parsed->encryption->name, "ecb(cipher_null)");
    EXPECT_EQ(K::EncryptionName(*parsed->encryption), "null");

    Msg del(K::BuildStateDelete(state));
    EXPECT_EQ(nlmsg_hdr(del.get())->nlmsg_type, XFRM_MSG_DELSA);
    const auto* id = static_cast<const xfrm_usersa_id*>(nlmsg_data(nlmsg_hdr(del.get())));
    EXPECT_EQ(ntohl(id->spi), 0x1234u);
    EXPECT_EQ(id->proto, IPPROTO_ESP);
    EXPECT_EQ(id->family, AF_INET6);
    char text[INET6_ADDRSTRLEN];
    EXPECT_STREQ(inet_ntop(AF_INET6, &id->daddr, text, sizeof text), "2001:db8::2");
    // A delete is no state.
    EXPECT_FALSE(K::ParseState(del.get()));
}

TEST(XfrmState, RequestsThatCannotBeExpressedAreRefused) {
    K::XfrmState shortKey = AesState();
    shortKey.encryption->key = "short";
    EXPECT_THROW({ Msg m(K::BuildStateAdd(shortKey)); }, HostCtlException);
    K::XfrmState badAddress = AesState();
    badAddress.destination = "2001:db8::zz";
    EXPECT_THROW({ Msg m(K::BuildStateAdd(badAddress)); }, HostCtlException);
}

TEST(XfrmAlgorithms, NamesKeysAndTheirKernelAlgorithms) {
    for (const char* name : {"null", "3des-cbc", "aes128-cbc"})
        EXPECT_EQ(K::EncryptionName(*K::EncryptionByName(name)), name);
    for (const char* name : {"hmac-sha1", "hmac-sha2-256"})
        EXPECT_EQ(K::IntegrityName(*K::IntegrityByName(name)), name);
    EXPECT_EQ(K::IntegrityByName("hmac-sha2-256")->truncationBits, 128u);
    EXPECT_EQ(K::EncryptionByName("3des-cbc")->keyBits, 192u);
    EXPECT_FALSE(K::EncryptionByName("aes256-gcm"));
    // What the commands cannot name: other key sizes and truncations.
    EXPECT_EQ(K::EncryptionName({"cbc(aes)", 256, 0, {}}), "");
    EXPECT_EQ(K::IntegrityName({"hmac(sha256)", 256, 96, {}}), "");
    EXPECT_EQ(K::IntegrityName({"hmac(md5)", 128, 96, {}}), "");

    EXPECT_EQ(K::KeyBytes("0x00ff10"), std::string("\x00\xff\x10", 3));
    EXPECT_EQ(K::KeyBytes("0XAbCd"), "\xab\xcd");
    EXPECT_EQ(K::KeyBytes("plain text"), "plain text");
    EXPECT_THROW(K::KeyBytes("0xabc"), HostCtlException);
    EXPECT_THROW(K::KeyBytes("0xgg"), HostCtlException);
}

K::XfrmPolicy TcpPolicy() {
    K::XfrmPolicy policy;
    policy.selector.source = "2001:db8::";
    policy.selector.sourcePrefix = 64;
    policy.selector.destination = "2001:db8:1::5";
    policy.selector.destinationPrefix = 128;
    policy.selector.destinationPort = 22;
    policy.selector.protocol = IPPROTO_TCP;
    policy.direction = K::kXfrmIn;
    K::XfrmTemplate tmpl;
    tmpl.spi = 0x1234;
    tmpl.source = "2001:db8::1";
    tmpl.destination = "2001:db8::2";
    tmpl.mode = K::kXfrmTunnel;
    policy.templates.push_back(tmpl);
    return policy;
}

TEST(XfrmPolicy, AnAddRequestCarriesSelectorAndTemplateAndReadsBack) {
    Msg msg(K::BuildPolicyAdd(TcpPolicy()));
    nlmsghdr* header = nlmsg_hdr(msg.get());
    EXPECT_EQ(header->nlmsg_type, XFRM_MSG_NEWPOLICY);
    const auto* info = static_cast<const xfrm_userpolicy_info*>(nlmsg_data(header));
    EXPECT_EQ(info->sel.family, AF_INET6);
    EXPECT_EQ(info->sel.prefixlen_s, 64);
    EXPECT_EQ(ntohs(info->sel.dport), 22);
    EXPECT_EQ(info->sel.dport_mask, 0xffff);
    EXPECT_EQ(info->sel.sport_mask, 0);  // any source port
    EXPECT_EQ(info->dir, XFRM_POLICY_IN);
    EXPECT_EQ(info->action, XFRM_POLICY_ALLOW);
    const nlattr* tmpls = Attribute(msg.get(), sizeof(xfrm_userpolicy_info), XFRMA_TMPL);
    ASSERT_NE(tmpls, nullptr);
    ASSERT_EQ(nla_len(tmpls), static_cast<int>(sizeof(xfrm_user_tmpl)));
    const auto* tmpl = static_cast<const xfrm_user_tmpl*>(nla_data(tmpls));
    EXPECT_EQ(tmpl->id.proto, IPPROTO_ESP);
    EXPECT_EQ(ntohl(tmpl->id.spi), 0x1234u);
    EXPECT_EQ(tmpl->ealgos, ~0u);  // any algorithm will do
    EXPECT_EQ(tmpl->optional, 0);

    auto parsed = K::ParsePolicy(msg.get());
    ASSERT_TRUE(parsed);
    K::XfrmPolicy expected = TcpPolicy();
    EXPECT_EQ(parsed->selector, expected.selector);
    EXPECT_EQ(parsed->direction, K::kXfrmIn);
    EXPECT_EQ(parsed->templates, expected.templates);
    EXPECT_FALSE(K::ParseState(msg.get()));
}

TEST(XfrmPolicy, ADiscardPolicyHasNoTemplateAndIsDeletedByIndex) {
    K::XfrmPolicy policy = TcpPolicy();
    policy.templates.clear();
    policy.action = K::kXfrmBlock;
    Msg add(K::BuildPolicyAdd(policy));
    EXPECT_EQ(Attribute(add.get(), sizeof(xfrm_userpolicy_info), XFRMA_TMPL), nullptr);
    auto parsed = K::ParsePolicy(add.get());
    ASSERT_TRUE(parsed);
    EXPECT_EQ(parsed->action, K::kXfrmBlock);
    EXPECT_TRUE(parsed->templates.empty());

    policy.index = 4711;
    policy.direction = K::kXfrmOut;
    Msg del(K::BuildPolicyDelete(policy));
    EXPECT_EQ(nlmsg_hdr(del.get())->nlmsg_type, XFRM_MSG_DELPOLICY);
    const auto* id = static_cast<const xfrm_userpolicy_id*>(nlmsg_data(nlmsg_hdr(del.get())));
    EXPECT_EQ(id->index, 4711u);
    EXPECT_EQ(id->dir, XFRM_POLICY_OUT);

    K::XfrmPolicy tooLong = policy;
    tooLong.selector.sourcePrefix = 129;
    EXPECT_THROW({ Msg m(K::BuildPolicyAdd(tooLong)); }, HostCtlException);
}

}  // namespace
