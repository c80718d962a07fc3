// Root token buckets through libnl-route, without a kernel: the request a port's shaping
// sends reads back, as the kernel's reply would, as the bucket that was asked for.
#include <gtest/gtest.h>
#include <linux/pkt_sched.h>
#include <linux/rtnetlink.h>
#include <netlink/msg.h>

#include <memory>

#include "hostctl/exception.h"
#include "kernel/qdiscs.h"

namespace {

using namespace TknCtl::Linux::Kernel;

struct MessageFree {
    void operator()(nl_msg* message) const { nlmsg_free(message); }
};
using Message = std::unique_ptr<nl_msg, MessageFree>;

std::optional<RootQdisc> RoundTrip(const TokenBucket& bucket) {
    Message request(BuildTokenBucket(5, bucket));
    nlmsghdr* header = nlmsg_hdr(request.get());
    EXPECT_EQ(header->nlmsg_type, RTM_NEWQDISC);
    EXPECT_EQ(header->nlmsg_flags & (NLM_F_CREATE | NLM_F_REPLACE), NLM_F_CREATE | NLM_F_REPLACE);
    return ParseQdisc(request.get());
}

TEST(TokenBuckets, ARequestReadsBackAsTheBucketAsked) {
    // 100000 Kbps average, 200000 Kbps peak, 819200 Kib of burst, a port of MTU 1500.
    TokenBucket asked{12500000, 104857600, 25000000, 1518, 105482600};
    auto root = RoundTrip(asked);
    ASSERT_TRUE(root);
    EXPECT_EQ(root->link, 5);
    EXPECT_EQ(root->kind, "tbf");
    ASSERT_TRUE(root->bucket);
    EXPECT_EQ(root->bucket->rate, asked.rate);
    EXPECT_EQ(root->bucket->peakRate, asked.peakRate);
    EXPECT_EQ(root->bucket->limit, asked.limit);
    // The burst goes through microseconds and ticks: a few bytes' worth of a microsecond.
    EXPECT_NEAR(root->bucket->burst, asked.burst, 2.0 * asked.rate / 1e6 + 16);
    EXPECT_NEAR(root->bucket->peakBucket, asked.peakBucket, 2.0 * asked.peakRate / 1e6 + 16);

    TokenBucket flat{125000, 12800, 0, 0, 19050};
    root = RoundTrip(flat);
    ASSERT_TRUE(root && root->bucket);
    EXPECT_EQ(root->bucket->peakRate, 0u);
    EXPECT_EQ(root->bucket->peakBucket, 0u);
    EXPECT_NEAR(root->bucket->burst, 12800, 16);
}

TEST(TokenBuckets, RatesOutsideWhatTheBucketTakesAreRefused) {
    EXPECT_THROW(BuildTokenBucket(5, {0, 1000, 0, 0, 1000}), HostCtl::Lib::HostCtlException);
    EXPECT_THROW(BuildTokenBucket(5, {kMaxBucketRate + 1u, 1000, 0, 0, 1000}),
                 HostCtl::Lib::HostCtlException);
    EXPECT_THROW(BuildTokenBucket(5, {1000, 1000, kMaxBucketRate + 1u, 1518, 1000}),
                 HostCtl::Lib::HostCtlException);
}

TEST(TokenBuckets, TheRootOfALinkIsDeletedAndOnlyRootsAreRead) {
    Message remove(BuildRootDelete(9));
    nlmsghdr* header = nlmsg_hdr(remove.get());
    EXPECT_EQ(header->nlmsg_type, RTM_DELQDISC);
    const auto* tc = static_cast<tcmsg*>(nlmsg_data(header));
    EXPECT_EQ(tc->tcm_ifindex, 9);
    EXPECT_EQ(tc->tcm_parent, TC_H_ROOT);

    // A discipline below another is no link's root.
    Message child(nlmsg_alloc_simple(RTM_NEWQDISC, 0));
    tcmsg below{};
    below.tcm_ifindex = 9;
    below.tcm_parent = 0x10001;
    below.tcm_handle = 0x20000;
    nlmsg_append(child.get(), &below, sizeof(below), NLMSG_ALIGNTO);
    nla_put_string(child.get(), TCA_KIND, "fq_codel");
    EXPECT_FALSE(ParseQdisc(child.get()));
    Message root(nlmsg_alloc_simple(RTM_NEWQDISC, 0));
    below.tcm_parent = TC_H_ROOT;
    below.tcm_handle = 0;
    nlmsg_append(root.get(), &below, sizeof(below), NLMSG_ALIGNTO);
    nla_put_string(root.get(), TCA_KIND, "noqueue");
    EXPECT_EQ(ParseQdisc(root.get()), (RootQdisc{9, "noqueue", 0, std::nullopt}));
}

}  // namespace
