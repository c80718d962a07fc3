// Network device settings through ethtool: the generic netlink family "ethtool" where it serves,
// the SIOCETHTOOL ioctl for what the family lacks (driver information, the permanent address,
// register and EEPROM images, EEPROM writes, self tests, the restart of auto-negotiation and
// the RSS indirection table).
//
// Netlink requests are built and replies read into plain values by functions that need no
// kernel (BuildEthtool..., ParseEthtoolReply); Ethtool sends them inside a namespace:
//
//     Ethtool ethtool(Namespace::Own());
//     auto rings = ethtool.Get(ETHTOOL_MSG_RINGS_GET, "eth0");
//     std::uint32_t rx = rings.Value(ETHTOOL_A_RINGS_RX);
//     ethtool.Set(BuildEthtoolSet(ethtool.Family(), ETHTOOL_MSG_RINGS_SET, "eth0",
//                                 {{ETHTOOL_A_RINGS_RX, 512}}));
//
// A request the kernel or the driver refuses throws EthtoolRefusal: the error number and the
// kernel's own words (its extended acknowledgement, else the text of the error number).
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "hostctl/exception.h"
#include "kernel/netlink.h"

struct nl_msg;

namespace TknCtl::Linux::Kernel {

// The kernel or a driver refused an ethtool request. what() is the refusal alone ("Operation
// not supported", "cannot modify an unsupported parameter"); callers say what was asked.
class EthtoolRefusal : public HostCtl::Lib::HostCtlException {
public:
    EthtoolRefusal(int code, std::string refusal)
        : HostCtl::Lib::HostCtlException(std::move(refusal)), code_(code) {}
    // The error number (EOPNOTSUPP, EINVAL, EPERM, ...), positive.
    int Code() const { return code_; }
    // The driver has no such operation.
    bool Unsupported() const;

private:
    int code_;
};

// The refusal's text: the kernel's message when it gave one, else the error number's text.
std::string RefusalText(int code, const std::string& kernelMessage);

// One bit of a bit set: its index, its name (verbose replies name each bit) and its value.
struct EthtoolBit {
    std::uint32_t index = 0;
    std::string name;
    bool on = false;
};

// A bit set of a reply (link modes, Wake-on modes, features, message classes). A set with a
// mask ("supported" and "advertised" in one) lists the bits of the mask, each on when it is
// in the value; a plain list (no mask) lists the bits that are on.
struct EthtoolBitset {
    bool list = false;
    std::vector<EthtoolBit> bits;

    const EthtoolBit* Find(const std::string& name) const;
    // Listed (in the mask) and on (in the value).
    bool IsOn(const std::string& name) const;
    bool Has(const std::string& name) const { return Find(name) != nullptr; }
    // The bits below 32 that are on, as a mask.
    std::uint32_t Word() const;
    // The bits below 32 that are listed, as a mask (a set with a mask: its mask).
    std::uint32_t MaskWord() const;
};

// One statistics group of ETHTOOL_MSG_STATS_GET (ETHTOOL_STATS_ETH_MAC, ...): counter
// attribute -> value. Counters the driver does not keep are absent.
struct EthtoolStatsGroup {
    std::uint32_t id = 0;
    std::map<int, std::uint64_t> counters;
};

// A reply of the ethtool family read into plain values: its scalar attributes (u8, u16, u32
// and u64 alike), its bit sets, and for statistics its groups. An attribute the driver does
// not report is absent.
struct EthtoolReply {
    std::uint8_t command = 0;
    std::map<int, std::uint64_t> values;
    std::map<int, EthtoolBitset> bitsets;
    std::vector<EthtoolStatsGroup> statsGroups;

    bool Has(int attribute) const { return values.count(attribute) != 0; }
    // The attribute's value, or fallback when it is absent.
    std::uint64_t Value(int attribute, std::uint64_t fallback = 0) const;
    const EthtoolBitset* Bitset(int attribute) const;
};

// Reads a reply message; nothing when it is no message of the ethtool family's layout.
std::optional<EthtoolReply> ParseEthtoolReply(nl_msg* message);

// The request of a GET command for one device. flags: ETHTOOL_FLAG_... of the request header
// (bit sets are asked for in their verbose form, with names, unless flags say compact).
nl_msg* BuildEthtoolGet(int family, std::uint8_t command, const std::string& device, std::uint32_t flags = 0);
// The request of a SET command that changes the given scalar attributes (each is sent with
// the width the kernel expects of it: u8 or u32) and nothing else.
nl_msg* BuildEthtoolSet(int family, std::uint8_t command, const std::string& device,
                        const std::map<int, std::uint32_t>& values);
// A SET command that replaces a 32-bit bit set (ETHTOOL_MSG_WOL_SET ETHTOOL_A_WOL_MODES,
// ETHTOOL_MSG_DEBUG_SET ETHTOOL_A_DEBUG_MSGMASK) by value: bits not in value are cleared.
nl_msg* BuildEthtoolBitsetSet(int family, std::uint8_t command, const std::string& device, int attribute,
                              std::uint32_t value);
// ETHTOOL_MSG_FEATURES_SET asking for the named features on or off; others are left alone.
nl_msg* BuildFeaturesSet(int family, const std::string& device,
                         const std::vector<std::pair<std::string, bool>>& wanted);
// ETHTOOL_MSG_STATS_GET for the given groups (ETHTOOL_STATS_...).
nl_msg* BuildStatsGet(int family, const std::string& device, const std::vector<std::uint32_t>& groups);

// The kernel's own words in an error acknowledgement (NLMSG_ERROR with the extended
// acknowledgement's NLMSGERR_ATTR_MSG); empty when it gave none.
std::string ParseExtackMessage(nl_msg* message);

// Sends a request on a netlink socket (the request is freed), hands each reply message to
// onReply and returns when the kernel acknowledges it; a refusal throws EthtoolRefusal with the
// kernel's own words (the socket asks for extended acknowledgements).
void Transact(nl_sock* sock, nl_msg* request, const std::function<void(nl_msg*)>& onReply);

// The width in bytes of a scalar attribute of a SET command: 1 or 4.
int EthtoolAttributeWidth(std::uint8_t command, int attribute);

// The ethtool family inside a namespace.
class Ethtool {
public:
    // Throws HostCtlException when the kernel has no ethtool family (before 5.6).
    explicit Ethtool(const Namespace& ns);

    int Family() const { return family_; }
    // Sends a GET request and reads its reply; throws EthtoolRefusal.
    EthtoolReply Get(std::uint8_t command, const std::string& device, std::uint32_t flags = 0);
    // Sends a request (it is freed) and reads its reply, if the kernel sends one; throws
    // EthtoolRefusal.
    std::optional<EthtoolReply> Send(nl_msg* request);
    // The same for a change: the kernel's acknowledgement is all that comes back. (A dry run
    // records it instead: kernel/dryrun.h.)
    void Set(nl_msg* request);

private:
    nl_sock* sock_;
    int family_;
    Namespace ns_;
};

// ---------------------------------------------------------------- the ioctl

// ETHTOOL_GDRVINFO.
struct DriverInfo {
    std::string driver, version, firmwareVersion, busInfo;
    std::uint32_t statsCount = 0, testCount = 0, eepromLength = 0, registersLength = 0;
};

// A NUL-padded field of a kernel structure as text (at most size bytes).
std::string FixedText(const char* field, std::size_t size);
// A string set of ETHTOOL_GSTRINGS: count strings of ETH_GSTRING_LEN bytes each.
std::vector<std::string> ParseStringSet(const std::uint8_t* data, std::size_t count);
// The lines a self test reports: each test's name and its result ("Link test (on/offline): 0").
std::vector<std::string> SelfTestLines(const std::vector<std::string>& names,
                                       const std::vector<std::uint64_t>& results);

// The ioctls run in the program's own namespace, where the physical NICs are. Each throws
// EthtoolRefusal with the driver's refusal.
DriverInfo ReadDriverInfo(const std::string& device);
// The factory (permanent) MAC address; nothing when the device has none.
std::optional<std::string> ReadPermanentAddress(const std::string& device);
std::vector<std::uint8_t> ReadRegisters(const std::string& device, std::uint32_t length);
std::vector<std::uint8_t> ReadEeprom(const std::string& device, std::uint32_t offset, std::uint32_t length);
void WriteEeprom(const std::string& device, std::uint32_t magic, std::uint32_t offset,
                 const std::vector<std::uint8_t>& bytes);
struct SelfTest {
    bool failed = false;
    std::vector<std::string> lines;
};
SelfTest RunSelfTest(const std::string& device, bool online, std::uint32_t testCount);
void RestartNegotiation(const std::string& device);
// The RSS indirection table (one RX queue per entry); empty when the driver keeps none.
std::vector<std::uint32_t> ReadRssTable(const std::string& device);
// Writes the table; an empty one brings back the driver's default (spread over every queue).
void WriteRssTable(const std::string& device, const std::vector<std::uint32_t>& table);

}  // namespace TknCtl::Linux::Kernel
