// Section "dns": the resolver configuration of each netstack.
#pragma once

#include <string>
#include <vector>

#include "core/section.h"

namespace TknCtl::Model {

struct StackDns {
    std::string netstack;
    std::vector<std::string> servers;        // IPv4 or IPv6 addresses as text, in use order
    std::vector<std::string> searchDomains;  // in search order
};

struct DnsSection {
    static const Lib::SectionKind& Kind();
    std::vector<StackDns> stacks;

    const StackDns* Find(const std::string& netstack) const;
    StackDns* Find(const std::string& netstack);
};

}  // namespace TknCtl::Model
