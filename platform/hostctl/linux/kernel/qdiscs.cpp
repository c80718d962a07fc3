#include "kernel/qdiscs.h"

#include <linux/netlink.h>
#include <linux/pkt_sched.h>
#include <netlink/cache.h>
#include <netlink/msg.h>
#include <netlink/netlink.h>
#include <netlink/route/qdisc.h>
#include <netlink/route/qdisc/tbf.h>
#include <netlink/route/tc.h>

#include <cstring>
#include <memory>

#include "hostctl/exception.h"
#include "kernel/describe.h"
#include "kernel/dryrun.h"

namespace TknCtl::Linux::Kernel {

using HostCtl::Lib::HostCtlException;

namespace {

struct CacheFree {
    void operator()(nl_cache* cache) const { nl_cache_free(cache); }
};
struct QdiscPut {
    void operator()(rtnl_qdisc* qdisc) const { rtnl_qdisc_put(qdisc); }
};
using Qdisc = std::unique_ptr<rtnl_qdisc, QdiscPut>;

Qdisc RootOf(int link) {
    Qdisc qdisc(rtnl_qdisc_alloc());
    if (!qdisc) throw HostCtlException("out of memory");
    rtnl_tc_set_ifindex(TC_CAST(qdisc.get()), link);
    rtnl_tc_set_parent(TC_CAST(qdisc.get()), TC_H_ROOT);
    return qdisc;
}

// The cell of a rate table: the smallest power of two that keeps the largest frame within the
// table's 256 cells (as tc chooses it).
int Cell(std::uint32_t largest) {
    int cell = 1;
    while (largest / static_cast<std::uint32_t>(cell) > 255)
        cell <<= 1;
    return cell;
}

}  // namespace

std::optional<RootQdisc> QdiscFromObject(rtnl_qdisc* object) {
    rtnl_tc* tc = TC_CAST(object);
    if (rtnl_tc_get_parent(tc) != TC_H_ROOT) return std::nullopt;
    RootQdisc root;
    root.link = rtnl_tc_get_ifindex(tc);
    if (const char* kind = rtnl_tc_get_kind(tc)) root.kind = kind;
    root.handle = rtnl_tc_get_handle(tc);
    if (root.kind == "tbf") {
        TokenBucket bucket;
        auto get = [](int value) { return value < 0 ? 0u : static_cast<std::uint32_t>(value); };
        bucket.rate = get(rtnl_qdisc_tbf_get_rate(object));
        bucket.burst = get(rtnl_qdisc_tbf_get_rate_bucket(object));
        bucket.peakRate = get(rtnl_qdisc_tbf_get_peakrate(object));
        bucket.peakBucket = bucket.peakRate ? get(rtnl_qdisc_tbf_get_peakrate_bucket(object)) : 0;
        bucket.limit = get(rtnl_qdisc_tbf_get_limit(object));
        root.bucket = bucket;
    }
    return root;
}

std::optional<RootQdisc> ParseQdisc(nl_msg* message) {
    std::optional<RootQdisc> out;
    // libnl finds the parser by the message's protocol, which a message made here has not got.
    nlmsg_set_proto(message, NETLINK_ROUTE);
    auto take = [](nl_object* object, void* arg) {
        if (std::strcmp(nl_object_get_type(object), "route/qdisc") == 0)
            *static_cast<std::optional<RootQdisc>*>(arg) =
                QdiscFromObject(reinterpret_cast<rtnl_qdisc*>(object));
    };
    nl_msg_parse(message, take, &out);
    return out;
}

std::vector<RootQdisc> ListRootQdiscs(const Namespace& ns) {
    nl_cache* raw = nullptr;
    Check(
        rtnl_qdisc_alloc_cache(RouteSocket(ns), &raw),
        "cannot list the queueing disciplines" + (ns.IsOwn() ? std::string() : " in namespace " + ns.Name()));
    std::unique_ptr<nl_cache, CacheFree> cache(raw);
    std::vector<RootQdisc> roots;
    for (nl_object* object = nl_cache_get_first(raw); object; object = nl_cache_get_next(object)) {
        if (auto root = QdiscFromObject(reinterpret_cast<rtnl_qdisc*>(object)))
            roots.push_back(std::move(*root));
    }
    return roots;
}

nl_msg* BuildTokenBucket(int link, const TokenBucket& bucket) {
    if (bucket.rate == 0 || bucket.rate > kMaxBucketRate || bucket.peakRate > kMaxBucketRate)
        throw HostCtlException("A token bucket's rates are 1 to " + std::to_string(kMaxBucketRate) +
                               " bytes per second");
    Qdisc qdisc = RootOf(link);
    rtnl_tc* tc = TC_CAST(qdisc.get());
    Check(rtnl_tc_set_kind(tc, "tbf"), "cannot make a token bucket");
    if (bucket.peakBucket) rtnl_tc_set_mtu(tc, bucket.peakBucket);
    rtnl_qdisc_tbf_set_rate(qdisc.get(), static_cast<int>(bucket.rate), static_cast<int>(bucket.burst), 0);
    if (bucket.peakRate) {
        Check(rtnl_qdisc_tbf_set_peakrate(qdisc.get(), static_cast<int>(bucket.peakRate),
                                          static_cast<int>(bucket.peakBucket), Cell(bucket.peakBucket)),
              "cannot set the peak rate of a token bucket");
    }
    rtnl_qdisc_tbf_set_limit(qdisc.get(), static_cast<int>(bucket.limit));
    nl_msg* message = nullptr;
    Check(rtnl_qdisc_build_add_request(qdisc.get(), NLM_F_CREATE | NLM_F_REPLACE, &message),
          "cannot build the request of a token bucket");
    return message;
}

void ReplaceTokenBucket(const Namespace& ns, int link, const std::string& name, const TokenBucket& bucket) {
    if (DryRun()) return Record(DescribeTokenBucket(name, bucket), ns);
    Check(nl_send_sync(RouteSocket(ns), BuildTokenBucket(link, bucket)),
          "Cannot shape the traffic of " + name + " with a token bucket");
}

nl_msg* BuildRootDelete(int link) {
    Qdisc qdisc = RootOf(link);
    nl_msg* message = nullptr;
    Check(rtnl_qdisc_build_delete_request(qdisc.get(), &message),
          "cannot build the removal of a token bucket");
    return message;
}

void DeleteRootQdisc(const Namespace& ns, int link, const std::string& name) {
    if (DryRun()) return Record(DescribeRootDelete(name), ns);
    Check(nl_send_sync(RouteSocket(ns), BuildRootDelete(link)), "Cannot remove the token bucket of " + name);
}

}  // namespace TknCtl::Linux::Kernel
