#include "model/routes.h"

#include "model/netstacks.h"
#include "model/tknnics.h"
#include "model/values.h"

namespace TknCtl::Model {

const StackRoutes* RoutesSection::Find(const std::string& netstack) const {
    for (const auto& stack : stacks) {
        if (stack.netstack == netstack) return &stack;
    }
    return nullptr;
}

StackRoutes* RoutesSection::Find(const std::string& netstack) {
    return const_cast<StackRoutes*>(static_cast<const RoutesSection*>(this)->Find(netstack));
}

namespace {

using Json::In;
using Json::Node;

void Load(const In& in, RoutesSection& section) {
    in.Elements([&](const In& item) {
        StackRoutes stack;
        stack.netstack = item.Str("netstack");
        item.Each("ipv4", [&](const In& r) {
            Ipv4Route route;
            route.network = ReadIpv4Network(r.Member("network"));
            route.gateway = ReadIpv4(r.Member("gateway"));
            route.interface = r.Str("interface", "");
            route.source = r.Str("source", "MANUAL");
            r.Done();
            stack.ipv4.push_back(std::move(route));
        });
        item.Each("ipv6", [&](const In& r) {
            Ipv6Route route;
            route.network = ReadIpv6Network(r.Member("network"));
            route.gateway = ReadIpv6(r.Member("gateway"));
            route.interface = r.Str("interface", "");
            r.Done();
            stack.ipv6.push_back(std::move(route));
        });
        if (auto g = item.OptMember("ipv4ConfigGateway")) stack.ipv4ConfigGateway = ReadIpv4(*g);
        if (auto g = item.OptMember("ipv6ConfigGateway")) stack.ipv6ConfigGateway = ReadIpv6(*g);
        item.Done();
        section.stacks.push_back(std::move(stack));
    });
}

Node Save(const RoutesSection& section) {
    using Json::Object;
    Node out = Node::array();
    for (const auto& stack : section.stacks) {
        Node v4 = Node::array();
        for (const auto& r : stack.ipv4) {
            v4.push_back(Object("network", r.network.GetStringAddress(), "gateway",
                                r.gateway.GetStringAddress(), "interface", r.interface, "source", r.source));
        }
        Node v6 = Node::array();
        for (const auto& r : stack.ipv6) {
            v6.push_back(Object("network", r.network.GetStringAddress(), "gateway",
                                r.gateway.GetStringAddress(), "interface", r.interface));
        }
        out.push_back(Object("netstack", stack.netstack, "ipv4", std::move(v4), "ipv6", std::move(v6),
                             "ipv4ConfigGateway", stack.ipv4ConfigGateway.GetStringAddress(),
                             "ipv6ConfigGateway", stack.ipv6ConfigGateway.GetStringAddress()));
    }
    return out;
}

void Check(const RoutesSection& section, Lib::Checker& checker) {
    RequireUnique(
        section.stacks, [](const StackRoutes& s) { return s.netstack; }, checker, "netstack");
    for (const auto& stack : section.stacks) {
        if (!checker.Get<NetstacksSection>().Find(stack.netstack)) {
            checker.Fail("routes of unknown netstack " + Lib::Quote(stack.netstack));
        }
        auto checkInterface = [&](const std::string& name) {
            if (!name.empty() && !checker.Get<TknNicsSection>().Find(name)) {
                checker.Fail("route through unknown interface " + Lib::Quote(name));
            }
        };
        for (const auto& r : stack.ipv4)
            checkInterface(r.interface);
        for (const auto& r : stack.ipv6)
            checkInterface(r.interface);
    }
}

}  // namespace

const Lib::SectionKind& RoutesSection::Kind() {
    static const Json::JsonSection<RoutesSection> kind("routes", Load, Save, Check);
    return kind;
}

}  // namespace TknCtl::Model
