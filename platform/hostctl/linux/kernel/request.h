// Requests and dumps of rtnetlink as plain messages, under the files of each object kind
// (addresses, routes, neighbours, ...):
//
//     nl_msg* message = BuildRouteRequest(RTM_NEWROUTE, NLM_F_CREATE | NLM_F_EXCL, route);
//     Request(ns, message, "Cannot add route 10.2.0.0/16 via 10.1.0.2");   // waits for the answer
//     Dump(ns, RTM_GETROUTE, &header, sizeof(header), restart, each, "cannot list the routes");
//
// A refusal is reported with the kernel's own reason: its extended message when it gives one
// ("Nexthop has invalid gateway"), else the text of its error number ("File exists").
#pragma once

#include <cstddef>
#include <functional>
#include <string>

#include "kernel/netlink.h"

struct nl_msg;
struct nlmsghdr;

struct nlattr;

namespace TknCtl::Linux::Kernel {

// The kernel's answer to a request: 0 or a negative error number, and the reason it gave.
struct Answer {
    int error = 0;
    std::string reason;  // the extended message; empty when the kernel gave none
};

// Sends a request (the message is freed) and waits for the kernel's answer.
Answer TryRequest(const Namespace& ns, nl_msg* message);
// The same; a refusal throws HostCtlException(what + ": " + the reason, or the error's text).
void Request(const Namespace& ns, nl_msg* message, const std::string& what);
// The message of a refusal as Request words it: the reason, else the text of the error number.
std::string RefusalText(const Answer& answer);

// The kernel's answer carried by an NLMSG_ERROR message: its error number and its extended
// message (NLMSGERR_ATTR_MSG) when there is one.
Answer ParseAnswer(const nlmsghdr* message);

// Dumps a table: sends type (RTM_GETADDR, ...) with NLM_F_DUMP and the family header given,
// and calls each with every message of the reply. A dump the kernel interrupted because the
// table changed meanwhile is made again, after restart() (which forgets what each gathered).
// Throws HostCtlException(what + ": " + the reason) when the kernel refuses the dump.
void Dump(const Namespace& ns, int type, const void* header, std::size_t size,
          const std::function<void()>& restart, const std::function<void(const nlmsghdr*)>& each,
          const std::string& what);

// Changes made to the kernel by this process, counted: what was read of the kernel before a
// change is read again after it. Request raises the count; a change made otherwise (a sysctl
// file) calls Changed().
unsigned long Generation();
void Changed();

// An address as text (inet_ntop): family AF_INET (4 bytes) or AF_INET6 (16 bytes); empty for
// another family or length.
std::string AddressText(int family, const void* bytes, std::size_t length);
// The address an attribute holds, as text; empty for no attribute.
std::string AttributeAddress(int family, const nlattr* attr);
// The bytes of an address given as text; false when the text is no address of the family.
bool AddressBytes(int family, const std::string& text, unsigned char bytes[16]);

}  // namespace TknCtl::Linux::Kernel
