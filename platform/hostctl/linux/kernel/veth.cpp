#include "kernel/veth.h"

#include <fcntl.h>
#include <linux/if_link.h>
#include <linux/rtnetlink.h>
#include <linux/veth.h>
#include <netlink/attr.h>
#include <netlink/msg.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <memory>

#include "hostctl/exception.h"
#include "kernel/describe.h"
#include "kernel/dryrun.h"
#include "kernel/request.h"

namespace TknCtl::Linux::Kernel {

using HostCtl::Lib::HostCtlException;

namespace {

struct MessageFree {
    void operator()(nl_msg* message) const { nlmsg_free(message); }
};
using Message = std::unique_ptr<nl_msg, MessageFree>;

void Put(int error) {
    if (error < 0) throw HostCtlException("cannot build a request to the kernel: " + ErrorText(error));
}

void PutHeader(nl_msg* message, int index = 0) {
    ifinfomsg header{};
    header.ifi_family = AF_UNSPEC;
    header.ifi_index = index;
    Put(nlmsg_append(message, &header, sizeof(header), NLMSG_ALIGNTO));
}

void PutMac(nl_msg* message, const std::string& text) {
    unsigned values[6];
    char rest = 0;
    if (text.size() != 17 || std::sscanf(text.c_str(), "%2x:%2x:%2x:%2x:%2x:%2x%c", &values[0], &values[1],
                                         &values[2], &values[3], &values[4], &values[5], &rest) != 6)
        throw HostCtlException("Invalid MAC address " + text);
    unsigned char bytes[6];
    for (int i = 0; i < 6; ++i)
        bytes[i] = static_cast<unsigned char>(values[i]);
    Put(nla_put(message, IFLA_ADDRESS, sizeof(bytes), bytes));
}

// The attributes of one end, after its ifinfomsg.
void PutEnd(nl_msg* message, const VethEnd& end) {
    Put(nla_put_string(message, IFLA_IFNAME, end.name.c_str()));
    if (!end.mac.empty()) PutMac(message, end.mac);
    if (end.mtu) Put(nla_put_u32(message, IFLA_MTU, end.mtu));
    if (end.rxQueues) Put(nla_put_u32(message, IFLA_NUM_RX_QUEUES, end.rxQueues));
    if (end.gsoMaxSize) Put(nla_put_u32(message, IFLA_GSO_MAX_SIZE, end.gsoMaxSize));
}

nlattr* Nest(nl_msg* message, int type) {
    nlattr* nest = nla_nest_start(message, type);
    if (!nest) throw HostCtlException("out of memory");
    return nest;
}

}  // namespace

nl_msg* BuildVethAdd(const VethPair& pair, int peerNamespaceFd) {
    Message message(nlmsg_alloc_simple(RTM_NEWLINK, NLM_F_REQUEST | NLM_F_CREATE | NLM_F_EXCL));
    if (!message) throw HostCtlException("out of memory");
    PutHeader(message.get(), pair.end.index);
    PutEnd(message.get(), pair.end);
    nlattr* info = Nest(message.get(), IFLA_LINKINFO);
    Put(nla_put_string(message.get(), IFLA_INFO_KIND, "veth"));
    nlattr* data = Nest(message.get(), IFLA_INFO_DATA);
    // The peer is a link request of its own inside the nest: its ifinfomsg, then its attributes.
    nlattr* peer = Nest(message.get(), VETH_INFO_PEER);
    PutHeader(message.get(), pair.peer.index);
    PutEnd(message.get(), pair.peer);
    if (peerNamespaceFd >= 0)
        Put(nla_put_u32(message.get(), IFLA_NET_NS_FD, static_cast<std::uint32_t>(peerNamespaceFd)));
    nla_nest_end(message.get(), peer);
    nla_nest_end(message.get(), data);
    nla_nest_end(message.get(), info);
    return message.release();
}

void AddVeth(const Namespace& ns, const VethPair& pair, const Namespace& peerNs) {
    const std::string what = "Cannot create veth pair " + pair.end.name + "/" + pair.peer.name;
    if (DryRun()) {
        // The peer's namespace may be one the dry run would make: no file of it is opened.
        Record(DescribeVethAdd(pair, peerNs == ns ? std::string() : NetstackName(peerNs)), ns);
        PlanVeth(ns, pair, peerNs);
        return Changed();
    }
    int fd = -1;
    if (!(peerNs == ns)) {
        fd = open(peerNs.Path().c_str(), O_RDONLY | O_CLOEXEC);
        if (fd < 0) {
            throw HostCtlException(what + ": cannot open network namespace " + peerNs.Name() + ": " +
                                   std::strerror(errno));
        }
    }
    struct Close {
        int fd;
        ~Close() {
            if (fd >= 0) close(fd);
        }
    } closer{fd};
    Request(ns, BuildVethAdd(pair, fd), what);
}

}  // namespace TknCtl::Linux::Kernel
