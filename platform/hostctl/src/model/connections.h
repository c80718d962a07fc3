// Section "connections": the sockets of each netstack (TCP, UDP and raw IP), each owned by a
// world.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "core/section.h"

namespace TknCtl::Model {

// Socket classes. TCP states: 0 CLOSED, 1 LISTEN, 2 SYN_SENT, 3 SYN_RCVD, 4 ESTABLISHED,
// 5 CLOSE_WAIT, 6 FIN_WAIT_1, 7 CLOSING, 8 LAST_ACK, 9 FIN_WAIT_2, 10 TIME_WAIT.
inline const char* const kConnectionProtocols[] = {"tcp", "udp", "ip"};

struct TcpIpConnection {
    std::uint32_t protocol = 0;  // kConnectionProtocols
    std::uint32_t recvQ = 0;
    std::uint32_t sendQ = 0;
    std::string localAddress;  // IPv4 or IPv6 text
    std::uint16_t localPort = 0;
    std::string foreignAddress;
    std::uint16_t foreignPort = 0;
    std::uint32_t state = 0;
    std::uint32_t worldId = 0;  // a world of "worlds"
    std::string ccAlgo;
};

struct StackConnections {
    std::string netstack;
    std::vector<TcpIpConnection> connections;
};

struct ConnectionsSection {
    static const Lib::SectionKind& Kind();
    std::vector<StackConnections> stacks;

    const StackConnections* Find(const std::string& netstack) const;
    StackConnections* Find(const std::string& netstack);
};

}  // namespace TknCtl::Model
