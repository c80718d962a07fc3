#include "model/neighbors.h"

#include "model/netstacks.h"
#include "model/tknnics.h"
#include "model/values.h"

namespace TknCtl::Model {

const StackNeighbors* NeighborsSection::Find(const std::string& netstack) const {
    for (const auto& stack : stacks) {
        if (stack.netstack == netstack) return &stack;
    }
    return nullptr;
}

StackNeighbors* NeighborsSection::Find(const std::string& netstack) {
    return const_cast<StackNeighbors*>(static_cast<const NeighborsSection*>(this)->Find(netstack));
}

namespace {

using Json::In;
using Json::Node;

template <class Entry, class ReadAddress>
void LoadEntries(const In& in, const char* key, std::vector<Entry>& out, ReadAddress read) {
    in.Each(key, [&](const In& item) {
        Entry entry;
        entry.address = read(item.Member("address"));
        entry.mac = item.Str("mac", "");
        entry.interface = item.Str("interface");
        entry.expiry = item.Int<std::uint32_t>("expiry", 0);
        entry.state = item.Int<std::uint32_t>("state", 0);
        entry.type = item.Str("type", entry.type);
        item.Done();
        out.push_back(std::move(entry));
    });
}

template <class Entry>
Node SaveEntries(const std::vector<Entry>& entries) {
    Node out = Node::array();
    for (const auto& e : entries) {
        out.push_back(Json::Object("address", e.address.GetStringAddress(), "mac", e.mac, "interface",
                                   e.interface, "expiry", e.expiry, "state", e.state, "type", e.type));
    }
    return out;
}

void Load(const In& in, NeighborsSection& section) {
    in.Elements([&](const In& item) {
        StackNeighbors stack;
        stack.netstack = item.Str("netstack");
        LoadEntries(item, "ipv4", stack.ipv4, ReadIpv4);
        LoadEntries(item, "ipv6", stack.ipv6, ReadIpv6);
        item.Done();
        section.stacks.push_back(std::move(stack));
    });
}

Node Save(const NeighborsSection& section) {
    Node out = Node::array();
    for (const auto& stack : section.stacks) {
        out.push_back(Json::Object("netstack", stack.netstack, "ipv4", SaveEntries(stack.ipv4), "ipv6",
                                   SaveEntries(stack.ipv6)));
    }
    return out;
}

void Check(const NeighborsSection& section, Lib::Checker& checker) {
    RequireUnique(
        section.stacks, [](const StackNeighbors& s) { return s.netstack; }, checker, "netstack");
    for (const auto& stack : section.stacks) {
        if (!checker.Get<NetstacksSection>().Find(stack.netstack)) {
            checker.Fail("neighbours of unknown netstack " + Lib::Quote(stack.netstack));
        }
        auto checkInterface = [&](const std::string& name) {
            if (!checker.Get<TknNicsSection>().Find(name)) {
                checker.Fail("neighbour on unknown interface " + Lib::Quote(name));
            }
        };
        for (const auto& e : stack.ipv4)
            checkInterface(e.interface);
        for (const auto& e : stack.ipv6)
            checkInterface(e.interface);
    }
}

}  // namespace

const Lib::SectionKind& NeighborsSection::Kind() {
    static const Json::JsonSection<NeighborsSection> kind("neighbors", Load, Save, Check);
    return kind;
}

}  // namespace TknCtl::Model
