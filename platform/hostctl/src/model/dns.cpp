#include "model/dns.h"

#include "model/netstacks.h"
#include "model/values.h"

namespace TknCtl::Model {

const StackDns* DnsSection::Find(const std::string& netstack) const {
    for (const auto& stack : stacks) {
        if (stack.netstack == netstack) return &stack;
    }
    return nullptr;
}

StackDns* DnsSection::Find(const std::string& netstack) {
    return const_cast<StackDns*>(static_cast<const DnsSection*>(this)->Find(netstack));
}

namespace {

void Load(const Json::In& in, DnsSection& section) {
    in.Elements([&](const Json::In& item) {
        StackDns stack;
        stack.netstack = item.Str("netstack");
        stack.servers = item.Strings("servers");
        stack.searchDomains = item.Strings("searchDomains");
        item.Done();
        section.stacks.push_back(std::move(stack));
    });
}

Json::Node Save(const DnsSection& section) {
    Json::Node out = Json::Node::array();
    for (const auto& stack : section.stacks) {
        out.push_back({{"netstack", stack.netstack},
                       {"servers", stack.servers},
                       {"searchDomains", stack.searchDomains}});
    }
    return out;
}

void Check(const DnsSection& section, Lib::Checker& checker) {
    RequireUnique(
        section.stacks, [](const StackDns& s) { return s.netstack; }, checker, "netstack");
    for (const auto& stack : section.stacks) {
        if (!checker.Get<NetstacksSection>().Find(stack.netstack)) {
            checker.Fail("DNS settings of unknown netstack " + Lib::Quote(stack.netstack));
        }
        for (const auto& server : stack.servers) {
            if (!IsIpAddressText(server))
                checker.Fail("DNS server " + Lib::Quote(server) + " is not an IP address");
        }
        for (const auto& domain : stack.searchDomains) {
            if (domain.empty() || domain.find_first_of(" \t\r\n") != std::string::npos) {
                checker.Fail("invalid search domain " + Lib::Quote(domain));
            }
        }
    }
}

}  // namespace

const Lib::SectionKind& DnsSection::Kind() {
    static const Json::JsonSection<DnsSection> kind("dns", Load, Save, Check);
    return kind;
}

}  // namespace TknCtl::Model
