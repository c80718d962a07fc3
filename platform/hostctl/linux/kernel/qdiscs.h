// Root queueing disciplines of links through rtnetlink (libnl-route): what sits at the root of
// each link, and the token bucket (tbf) that shapes what a link sends.
//
// Requests are built (BuildTokenBucket) and replies read (QdiscFromObject, ParseQdisc) by
// functions of plain values, so that both are tested without a kernel.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "kernel/netlink.h"

struct nl_msg;
struct rtnl_qdisc;

namespace TknCtl::Linux::Kernel {

// A token bucket: the link sends at most `rate` bytes per second on average, in bursts of at
// most `burst` bytes, and never faster than `peakRate` (0: no peak rate) with a peak bucket of
// `peakBucket` bytes (at least the largest frame).
struct TokenBucket {
    std::uint32_t rate = 0;  // bytes per second
    std::uint32_t burst = 0;
    std::uint32_t peakRate = 0;
    std::uint32_t peakBucket = 0;
    std::uint32_t limit = 0;  // bytes that may wait for tokens

    bool operator==(const TokenBucket&) const = default;
};

// The largest rate (bytes per second) a token bucket of this program takes, and the longest a
// burst may last at the average rate (the kernel counts a bucket in 32-bit ticks of 64 ns).
constexpr std::uint32_t kMaxBucketRate = 0x7fffffff;
constexpr std::uint32_t kMaxBurstSeconds = 268;

// The root queueing discipline of a link.
struct RootQdisc {
    int link = 0;
    std::string kind;                   // "tbf", "noqueue", "fq_codel", "mq", ...
    std::uint32_t handle = 0;           // 0 for the discipline the kernel gives a link of its own accord
    std::optional<TokenBucket> bucket;  // set for a tbf

    bool operator==(const RootQdisc&) const = default;
};

// The root disciplines of every link of the namespace.
std::vector<RootQdisc> ListRootQdiscs(const Namespace& ns);
// A discipline as a libnl object, or a reply message (RTM_NEWQDISC), reads into a plain value;
// nothing for one that is not at a link's root.
std::optional<RootQdisc> QdiscFromObject(rtnl_qdisc* object);
std::optional<RootQdisc> ParseQdisc(nl_msg* message);

// The request that puts a token bucket at the root of a link, replacing what is there.
nl_msg* BuildTokenBucket(int link, const TokenBucket& bucket);
void ReplaceTokenBucket(const Namespace& ns, int link, const std::string& name, const TokenBucket& bucket);
// Deletes the root discipline of a link: the kernel gives it its own again.
nl_msg* BuildRootDelete(int link);
void DeleteRootQdisc(const Namespace& ns, int link, const std::string& name);

}  // namespace TknCtl::Linux::Kernel
