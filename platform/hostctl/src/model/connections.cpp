#include "model/connections.h"

#include <unordered_set>

#include "model/netstacks.h"
#include "model/values.h"
#include "model/worlds.h"

namespace TknCtl::Model {

const StackConnections* ConnectionsSection::Find(const std::string& netstack) const {
    for (const auto& stack : stacks) {
        if (stack.netstack == netstack) return &stack;
    }
    return nullptr;
}

StackConnections* ConnectionsSection::Find(const std::string& netstack) {
    return const_cast<StackConnections*>(static_cast<const ConnectionsSection*>(this)->Find(netstack));
}

namespace {

using Json::In;
using Json::Node;

void Load(const In& in, ConnectionsSection& section) {
    in.Elements([&](const In& item) {
        StackConnections stack;
        stack.netstack = item.Str("netstack");
        item.Each("connections", [&](const In& c) {
            TcpIpConnection conn;
            conn.protocol = Json::NameToCode(c.Member("protocol"), kConnectionProtocols);
            conn.recvQ = c.Int<std::uint32_t>("recvQ", 0);
            conn.sendQ = c.Int<std::uint32_t>("sendQ", 0);
            conn.localAddress = c.Str("localAddress");
            conn.localPort = c.Int<std::uint16_t>("localPort", 0);
            conn.foreignAddress = c.Str("foreignAddress");
            conn.foreignPort = c.Int<std::uint16_t>("foreignPort", 0);
            conn.state = c.Int<std::uint32_t>("state", 0);
            conn.worldId = c.Int<std::uint32_t>("worldId");
            conn.ccAlgo = c.Str("ccAlgo", "");
            c.Done();
            if (!IsIpAddressText(conn.localAddress))
                c.Fail("invalid local address " + Lib::Quote(conn.localAddress));
            if (!IsIpAddressText(conn.foreignAddress)) {
                c.Fail("invalid foreign address " + Lib::Quote(conn.foreignAddress));
            }
            stack.connections.push_back(std::move(conn));
        });
        item.Done();
        section.stacks.push_back(std::move(stack));
    });
}

Node Save(const ConnectionsSection& section) {
    Node out = Node::array();
    for (const auto& stack : section.stacks) {
        Node list = Node::array();
        for (const auto& c : stack.connections) {
            list.push_back(Json::Object("protocol", kConnectionProtocols[c.protocol < 3 ? c.protocol : 2],
                                        "recvQ", c.recvQ, "sendQ", c.sendQ, "localAddress", c.localAddress,
                                        "localPort", c.localPort, "foreignAddress", c.foreignAddress,
                                        "foreignPort", c.foreignPort, "state", c.state, "worldId", c.worldId,
                                        "ccAlgo", c.ccAlgo));
        }
        out.push_back(Json::Object("netstack", stack.netstack, "connections", std::move(list)));
    }
    return out;
}

void Check(const ConnectionsSection& section, Lib::Checker& checker) {
    RequireUnique(
        section.stacks, [](const StackConnections& s) { return s.netstack; }, checker, "netstack");
    std::unordered_set<std::uint32_t> worlds;
    for (const auto& world : checker.Get<WorldsSection>().worlds)
        worlds.insert(world.id);
    for (const auto& stack : section.stacks) {
        if (!checker.Get<NetstacksSection>().Find(stack.netstack)) {
            checker.Fail("connections of unknown netstack " + Lib::Quote(stack.netstack));
        }
        for (const auto& c : stack.connections) {
            if (!worlds.count(c.worldId)) {
                checker.Fail("connection owned by unknown world " + std::to_string(c.worldId));
            }
        }
    }
}

}  // namespace

const Lib::SectionKind& ConnectionsSection::Kind() {
    static const Json::JsonSection<ConnectionsSection> kind("connections", Load, Save, Check);
    return kind;
}

}  // namespace TknCtl::Model
