// The resolver configuration of the Tarkon netstacks.
#include <algorithm>
#include <cctype>

#include "backend/dns.h"
#include "backend/host.h"
#include "core/hook.h"
#include "core/section.h"
#include "core/text.h"
#include "hostctl/exception.h"
#include "hostctl/network/ip.h"
#include "model/dns.h"
#include "model/netstacks.h"

namespace TknCtl::Network {

using HostCtl::Lib::HostCtlException;

namespace {

// The canonical text of an address kept as text (as it was stored otherwise).
std::string Canonical(const std::string& text) {
    if (HostCtl::Network::Ipv4Address::IsValidAddress(text))
        return HostCtl::Network::Ipv4Address(text).GetStringAddress();
    if (HostCtl::Network::Ipv6Address::IsValidAddress(text))
        return HostCtl::Network::Ipv6Address(text).GetStringAddress();
    return text;
}

// A domain name as compared: lower case, without a final dot.
std::string Lower(std::string text) {
    std::transform(text.begin(), text.end(), text.begin(), [](unsigned char c) { return std::tolower(c); });
    if (!text.empty() && text.back() == '.') text.pop_back();
    return text;
}

// Why text is no domain name, or nothing: labels of 1 to 63 letters, digits and hyphens, not
// starting or ending with a hyphen, 253 characters at most (one final dot allowed).
const char* NotADomainName(const std::string& text) {
    std::string name = text;
    if (!name.empty() && name.back() == '.') name.pop_back();
    if (name.empty()) return "it is empty";
    if (name.size() > 253) return "it is longer than 253 characters";
    std::size_t start = 0;
    while (start <= name.size()) {
        std::size_t end = name.find('.', start);
        if (end == std::string::npos) end = name.size();
        std::string label = name.substr(start, end - start);
        if (label.empty()) return "it has an empty label";
        if (label.size() > 63) return "a label is longer than 63 characters";
        if (label.front() == '-' || label.back() == '-') return "a label starts or ends with a hyphen";
        for (unsigned char c : label) {
            if (!std::isalnum(c) && c != '-') return "it may hold only letters, digits, hyphens and dots";
        }
        start = end + 1;
    }
    return nullptr;
}

}  // namespace

DnsConfigImpl::DnsConfigImpl(const std::string& netstack) : netstack_(netstack) {}
DnsConfigImpl::~DnsConfigImpl() = default;

void DnsConfigImpl::Load() {
    if (auto* host = Lib::RealHost()) {
        host->GetDns().Read(netstack_, servers_, searchDomains_);
        loaded_ = true;
        return;
    }
    if (!Lib::Read<Model::NetstacksSection>().Find(netstack_))
        throw HostCtlException("Netstack instance " + Lib::Quote(netstack_) + " does not exist");
    const auto* stack = Lib::Read<Model::DnsSection>().Find(netstack_);
    servers_ = stack ? stack->servers : std::vector<std::string>();
    searchDomains_ = stack ? stack->searchDomains : std::vector<std::string>();
    loaded_ = true;
}

void DnsConfigImpl::LoadIfStale() {
    if (!loaded_) Load();
}

void DnsConfigImpl::Refresh() {
    Lib::Enter("TknCtl::Network::DnsConfigImpl::Refresh", netstack_);
    Load();
}

void DnsConfigImpl::AddNameServer(HostCtl::Network::IpAddress& server) {
    std::string text = server.GetStringAddress();
    Lib::Enter("TknCtl::Network::DnsConfigImpl::AddNameServer", netstack_, text);
    LoadIfStale();
    if (server.IsUnspecified())
        throw HostCtlException("DNS server address " + text + " is not a host address");
    for (const auto& existing : servers_) {
        if (Canonical(existing) == text)
            throw HostCtlException("DNS server " + text + " is already configured");
    }
    servers_.push_back(text);
}

void DnsConfigImpl::RemoveNameServer(HostCtl::Network::IpAddress& server) {
    std::string text = server.GetStringAddress();
    Lib::Enter("TknCtl::Network::DnsConfigImpl::RemoveNameServer", netstack_, text);
    LoadIfStale();
    auto it = std::find_if(servers_.begin(), servers_.end(),
                           [&](const std::string& existing) { return Canonical(existing) == text; });
    if (it == servers_.end()) throw HostCtlException("DNS server " + text + " is not configured");
    servers_.erase(it);
}

void DnsConfigImpl::RemoveNameServers() {
    Lib::Enter("TknCtl::Network::DnsConfigImpl::RemoveNameServers", netstack_);
    LoadIfStale();
    servers_.clear();
}

std::string DnsConfigImpl::GetSearchDomainsString() {
    Lib::Enter("TknCtl::Network::DnsConfigImpl::GetSearchDomainsString", netstack_);
    LoadIfStale();
    std::string out;
    for (const auto& domain : searchDomains_)
        out += (out.empty() ? "" : " ") + domain;
    return out;
}

void DnsConfigImpl::AddSearchDomain(const std::string& domain) {
    Lib::Enter("TknCtl::Network::DnsConfigImpl::AddSearchDomain", netstack_, domain);
    LoadIfStale();
    if (const char* why = NotADomainName(domain))
        throw HostCtlException("Invalid search domain " + Lib::Quote(domain) + ": " + why);
    for (const auto& existing : searchDomains_) {
        if (Lower(existing) == Lower(domain))
            throw HostCtlException("Search domain " + domain + " is already configured");
    }
    searchDomains_.push_back(domain);
}

void DnsConfigImpl::RemoveSearchDomain(std::string domain) {
    Lib::Enter("TknCtl::Network::DnsConfigImpl::RemoveSearchDomain", netstack_, domain);
    LoadIfStale();
    auto it = std::find_if(searchDomains_.begin(), searchDomains_.end(),
                           [&](const std::string& existing) { return Lower(existing) == Lower(domain); });
    if (it == searchDomains_.end())
        throw HostCtlException("Search domain " + Lib::Quote(domain) + " is not configured");
    searchDomains_.erase(it);
}

void DnsConfigImpl::SaveConfig() {
    Lib::Enter("TknCtl::Network::DnsConfigImpl::SaveConfig", netstack_);
    LoadIfStale();
    if (auto* host = Lib::RealHost()) return host->GetDns().Write(netstack_, servers_, searchDomains_);
    const auto* current = Lib::Read<Model::DnsSection>().Find(netstack_);
    if (current && current->servers == servers_ && current->searchDomains == searchDomains_) return;
    if (!current && servers_.empty() && searchDomains_.empty()) return;
    auto& section = Lib::Write<Model::DnsSection>();
    auto* stack = section.Find(netstack_);
    if (!stack) {
        section.stacks.push_back({});
        stack = &section.stacks.back();
        stack->netstack = netstack_;
    }
    stack->servers = servers_;
    stack->searchDomains = searchDomains_;
}

}  // namespace TknCtl::Network
