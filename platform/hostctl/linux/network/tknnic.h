// The interfaces the Linux host creates on port groups (network/tknnic.cpp), as plain values.
//
// An interface on a port group is a veth pair. Its named end ("tknN") carries the IP
// configuration in the namespace of its netstack. Its other end, the bridge end, is a port of
// the bridge of the port group's switch and so lives where the bridges are, in the default
// netstack; it is named after the interface, "tknN-port" (at most 11 bytes: interface names
// are unique across the host's netstacks, so their bridge ends are unique in the default one).
// The bridge end carries the switch's MTU, so that joining never changes the bridge's (a
// bridge takes the smallest MTU of its ports), and a MAC address starting with fe, the
// largest a unicast, locally administered address can start with, so that the bridge never
// takes it as its own (a bridge whose address was not set takes the lowest of its ports').
//
// The port group of the interface is the one whose ports (in the host's document, kept by the
// switches area) hold its bridge end while the end is a port of that port group's bridge.
#pragma once

#include <array>
#include <cstdint>
#include <functional>
#include <optional>
#include <string>

namespace TknCtl::Linux {

// The name of the bridge end of an interface, and the interface a bridge end belongs to
// (nothing for a name that is no bridge end's).
std::string BridgeEndName(const std::string& interface);
std::optional<std::string> InterfaceOfBridgeEnd(const std::string& port);

// The MAC address of a bridge end: fe followed by five bytes (random ones, for uniqueness).
std::string BridgeEndMac(const std::array<std::uint8_t, 5>& bytes);

// The lowest "tknN" (N from 0 to 255) that taken() refuses; throws HostCtlException when all
// are taken.
std::string FreeInterfaceName(const std::function<bool(const std::string&)>& taken);

}  // namespace TknCtl::Linux
