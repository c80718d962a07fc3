// Netstack instances.
#include "hostctl/network/netstack.h"

#include <algorithm>
#include <cctype>
#include <iterator>

#include "backend/host.h"
#include "backend/netstacks.h"
#include "core/hook.h"
#include "core/section.h"
#include "hostctl/exception.h"
#include "hostctl/network/network_info.h"
#include "hostctl/session.h"
#include "model/connections.h"
#include "model/dns.h"
#include "model/neighbors.h"
#include "model/netstacks.h"
#include "model/routes.h"
#include "model/tknnics.h"

namespace HostCtl::Network {
NetstackInstance::~NetstackInstance() = default;
}  // namespace HostCtl::Network

namespace TknCtl::Network {

using HostCtl::Lib::HostCtlException;
using HostCtl::Network::NetstackInstance;

namespace {

const char* const kDefaultNetstack = "defaultTcpipStack";

std::string Quoted(const std::string& text) {
    return "'" + text + "'";
}

[[noreturn]] void NoSuchNetstack(const std::string& key) {
    throw HostCtlException("Netstack instance " + Quoted(key) + " does not exist");
}

// A key: a letter, then letters, digits, '_', '-' or '.', at most MAX_KEY_LENGTH in all.
void CheckKey(const std::string& key) {
    bool ok = !key.empty() && key.size() <= NetstackInstance::MAX_KEY_LENGTH &&
              std::isalpha(static_cast<unsigned char>(key[0]));
    for (char c : key) {
        if (!std::isalnum(static_cast<unsigned char>(c)) && c != '_' && c != '-' && c != '.') ok = false;
    }
    if (!ok) {
        throw HostCtlException("Invalid netstack instance key " + Quoted(key) + ": a key is 1 to " +
                               std::to_string(NetstackInstance::MAX_KEY_LENGTH) +
                               " letters, digits, '_', '-' or '.', starting with a letter");
    }
}

void CheckName(const std::string& name) {
    bool ok = !name.empty() && name.size() <= NetstackInstance::MAX_NAME_LENGTH;
    for (char c : name) {
        if (static_cast<unsigned char>(c) < 0x20 || c == 0x7f) ok = false;
    }
    if (!ok) {
        throw HostCtlException("Invalid netstack instance name " + Quoted(name) + ": a name is 1 to " +
                               std::to_string(NetstackInstance::MAX_NAME_LENGTH) + " printable characters");
    }
}

void CheckMaxConnections(std::int64_t value) {
    if (value < NetstackInstance::MIN_MAX_CONNECTIONS || value > NetstackInstance::MAX_MAX_CONNECTIONS) {
        throw HostCtlException("Invalid maximum number of connections " + std::to_string(value) +
                               ": it must be from " + std::to_string(NetstackInstance::MIN_MAX_CONNECTIONS) +
                               " to " + std::to_string(NetstackInstance::MAX_MAX_CONNECTIONS));
    }
}

void CheckAlgorithm(const std::string& algorithm) {
    std::string names;
    for (const char* name : Model::kCongestionControlAlgorithms) {
        if (algorithm == name) return;
        names += names.empty() ? "" : ", ";
        names += name;
    }
    throw HostCtlException("Unknown congestion-control algorithm " + Quoted(algorithm) +
                           ": the host offers " + names);
}

// The Tarkon interfaces on a netstack, as "tkn0, tkn1".
std::string InterfacesOf(const std::string& key) {
    std::string names;
    for (const auto& nic : Lib::Read<Model::TknNicsSection>().nics) {
        if (nic.netstack != key) continue;
        names += names.empty() ? "" : ", ";
        names += nic.name;
    }
    return names;
}

// Drops the entry of a netstack from a per-netstack section. The section is opened (and so
// checked) before the netstack itself changes.
template <class Section>
void DropStackEntry(const std::string& key) {
    if (!Lib::Read<Section>().Find(key)) return;
    auto& stacks = Lib::Write<Section>().stacks;
    stacks.erase(
        std::remove_if(stacks.begin(), stacks.end(), [&](const auto& s) { return s.netstack == key; }),
        stacks.end());
}

// The netstacks of the real host the session manages, or nullptr on the simulated host.
Backend::Netstacks* RealNetstacks() {
    auto* host = Lib::RealHost();
    return host ? &host->GetNetstacks() : nullptr;
}

Backend::NetstackEntry RealNetstack(Backend::Netstacks& netstacks, const std::string& key) {
    auto entry = netstacks.Find(key);
    if (!entry) NoSuchNetstack(key);
    return *entry;
}

}  // namespace

// ---------------------------------------------------------------- NetstackInstanceImpl

NetstackInstanceImpl::NetstackInstanceImpl(const std::string& key, unsigned int maxConnections,
                                           std::string algorithm, bool ipv6Enabled, unsigned int kind)
    : key_(key), pending_(Pending{key, maxConnections, std::move(algorithm), ipv6Enabled, kind}) {}

NetstackInstanceImpl::NetstackInstanceImpl(std::string key) : key_(std::move(key)) {}

NetstackInstanceImpl::~NetstackInstanceImpl() = default;

std::vector<std::string> NetstackInstanceImpl::GetCongestionControlAlgorithmList() {
    // Also asked for while a command's parameters are declared, when no host session need be
    // open: the list is the host's fixed offer. Within a session the call goes through the
    // hook like any other; an injected fault yields an empty list.
    if (HostCtl::Lib::HostSession::Current()) {
        if (Lib::TryEnter("TknCtl::Network::NetstackInstanceImpl::GetCongestionControlAlgorithmList"))
            return {};
    }
    return {std::begin(Model::kCongestionControlAlgorithms), std::end(Model::kCongestionControlAlgorithms)};
}

namespace {

const Model::Netstack& EnterNetstack(const char* operation, const std::string& key,
                                     const std::string& args = {}) {
    Lib::Enter(std::string("HostCtl::Network::NetstackInstance::") + operation, key, args);
    const auto* netstack = Lib::Read<Model::NetstacksSection>().Find(key);
    if (!netstack) NoSuchNetstack(key);
    return *netstack;
}

Model::Netstack& EnterNetstackForWrite(const char* operation, const std::string& key,
                                       const std::string& args) {
    EnterNetstack(operation, key, args);
    return *Lib::Write<Model::NetstacksSection>().Find(key);
}

void Enter(const char* operation, const std::string& key, const std::string& args = {}) {
    Lib::Enter(std::string("HostCtl::Network::NetstackInstance::") + operation, key, args);
}

}  // namespace

std::string NetstackInstanceImpl::GetKey() const {
    Enter("GetKey", key_);
    return key_;
}

std::string NetstackInstanceImpl::GetName() const {
    if (pending_) {
        Enter("GetName", key_);
        return pending_->name;
    }
    if (auto* real = RealNetstacks()) {
        Enter("GetName", key_);
        return RealNetstack(*real, key_).name;
    }
    return EnterNetstack("GetName", key_).name;
}

void NetstackInstanceImpl::SetName(std::string name, bool persist) {
    if (pending_) {
        Enter("SetName", key_, Lib::Args(name, persist));
        CheckName(name);
        pending_->name = std::move(name);
        return;
    }
    if (auto* real = RealNetstacks()) {
        Enter("SetName", key_, Lib::Args(name, persist));
        RealNetstack(*real, key_);
        CheckName(name);
        return real->SetName(key_, name);
    }
    auto& netstack = EnterNetstackForWrite("SetName", key_, Lib::Args(name, persist));
    CheckName(name);
    netstack.name = std::move(name);
}

std::uint32_t NetstackInstanceImpl::GetMaxConnections() const {
    if (pending_) {
        Enter("GetMaxConnections", key_);
        return static_cast<std::uint32_t>(pending_->maxConnections);
    }
    if (auto* real = RealNetstacks()) {
        Enter("GetMaxConnections", key_);
        return real->ReadSettings(key_).maxConnections;
    }
    return EnterNetstack("GetMaxConnections", key_).maxConnections;
}

void NetstackInstanceImpl::SetMaxConnections(const std::int64_t& maxConnections, bool persist) {
    if (pending_) {
        Enter("SetMaxConnections", key_, Lib::Args(maxConnections, persist));
        CheckMaxConnections(maxConnections);
        pending_->maxConnections = maxConnections;
        return;
    }
    if (auto* real = RealNetstacks()) {
        Enter("SetMaxConnections", key_, Lib::Args(maxConnections, persist));
        RealNetstack(*real, key_);
        CheckMaxConnections(maxConnections);
        return real->SetMaxConnections(key_, static_cast<std::uint32_t>(maxConnections));
    }
    const auto& current = EnterNetstack("SetMaxConnections", key_, Lib::Args(maxConnections, persist));
    CheckMaxConnections(maxConnections);
    // Configured only: the kernel takes it when it next creates the netstack.
    if (current.maxConnections != maxConnections)
        Lib::Write<Model::NetstacksSection>().Find(key_)->maxConnections =
            static_cast<std::uint32_t>(maxConnections);
}

std::string NetstackInstanceImpl::GetCongestionControlAlgorithm() const {
    if (pending_) {
        Enter("GetCongestionControlAlgorithm", key_);
        return pending_->algorithm;
    }
    if (auto* real = RealNetstacks()) {
        Enter("GetCongestionControlAlgorithm", key_);
        return real->ReadSettings(key_).congestionControl;
    }
    return EnterNetstack("GetCongestionControlAlgorithm", key_).congestionControl;
}

void NetstackInstanceImpl::SetCongestionControlAlgorithm(std::string algorithm, bool persist) {
    if (pending_) {
        Enter("SetCongestionControlAlgorithm", key_, Lib::Args(algorithm, persist));
        CheckAlgorithm(algorithm);
        pending_->algorithm = std::move(algorithm);
        return;
    }
    if (auto* real = RealNetstacks()) {
        Enter("SetCongestionControlAlgorithm", key_, Lib::Args(algorithm, persist));
        RealNetstack(*real, key_);
        CheckAlgorithm(algorithm);
        return real->SetCongestionControl(key_, algorithm);
    }
    auto& netstack =
        EnterNetstackForWrite("SetCongestionControlAlgorithm", key_, Lib::Args(algorithm, persist));
    CheckAlgorithm(algorithm);
    netstack.congestionControl = std::move(algorithm);
}

bool NetstackInstanceImpl::GetCurrentIpv6Enabled() const {
    if (pending_) {
        Enter("GetCurrentIpv6Enabled", key_);
        return false;
    }
    if (auto* real = RealNetstacks()) {
        Enter("GetCurrentIpv6Enabled", key_);
        return real->ReadSettings(key_).currentIpv6Enabled;
    }
    return EnterNetstack("GetCurrentIpv6Enabled", key_).currentIpv6Enabled;
}

void NetstackInstanceImpl::SetIpv6Enabled(bool enabled, bool persist) {
    if (pending_) {
        Enter("SetIpv6Enabled", key_, Lib::Args(enabled, persist));
        pending_->ipv6Enabled = enabled;
        return;
    }
    if (auto* real = RealNetstacks()) {
        Enter("SetIpv6Enabled", key_, Lib::Args(enabled, persist));
        RealNetstack(*real, key_);
        return real->SetIpv6Enabled(key_, enabled);
    }
    const auto& current = EnterNetstack("SetIpv6Enabled", key_, Lib::Args(enabled, persist));
    if (current.ipv6Enabled != enabled)
        Lib::Write<Model::NetstacksSection>().Find(key_)->ipv6Enabled = enabled;
}

bool NetstackInstanceImpl::GetIpv6Enabled() const {
    if (pending_) {
        Enter("GetIpv6Enabled", key_);
        return pending_->ipv6Enabled;
    }
    if (auto* real = RealNetstacks()) {
        Enter("GetIpv6Enabled", key_);
        return real->ReadSettings(key_).ipv6Enabled;
    }
    return EnterNetstack("GetIpv6Enabled", key_).ipv6Enabled;
}

std::uint32_t NetstackInstanceImpl::GetState() const {
    if (pending_) {
        Enter("GetState", key_);
        return Model::kNetstackConfigured;
    }
    if (auto* real = RealNetstacks()) {
        Enter("GetState", key_);
        return RealNetstack(*real, key_).enabled ? Model::kNetstackEnabled : Model::kNetstackConfigured;
    }
    return EnterNetstack("GetState", key_).state;
}

std::uint32_t NetstackInstanceImpl::GetCurrentMaxConnections() const {
    if (pending_) {
        Enter("GetCurrentMaxConnections", key_);
        return 0;
    }
    if (auto* real = RealNetstacks()) {
        Enter("GetCurrentMaxConnections", key_);
        return real->ReadSettings(key_).currentMaxConnections;
    }
    return EnterNetstack("GetCurrentMaxConnections", key_).currentMaxConnections;
}

void NetstackInstanceImpl::Enable() {
    if (pending_) {
        Enter("Enable", key_);
        throw HostCtlException("Netstack instance " + Quoted(key_) + " has not been added yet");
    }
    if (auto* real = RealNetstacks()) {
        Enter("Enable", key_);
        RealNetstack(*real, key_);
        return real->Enable(key_);
    }
    const auto& current = EnterNetstack("Enable", key_);
    if (current.state == Model::kNetstackEnabled) return;
    auto& netstack = *Lib::Write<Model::NetstacksSection>().Find(key_);
    netstack.state = Model::kNetstackEnabled;
    netstack.currentMaxConnections = netstack.maxConnections;
    netstack.currentIpv6Enabled = netstack.ipv6Enabled;
}

void NetstackInstanceImpl::Disable() {
    if (pending_) {
        Enter("Disable", key_);
        throw HostCtlException("Netstack instance " + Quoted(key_) + " has not been added yet");
    }
    if (auto* real = RealNetstacks()) {
        Enter("Disable", key_);
        RealNetstack(*real, key_);
        if (key_ == kDefaultNetstack)
            throw HostCtlException("The default netstack instance " + Quoted(key_) + " cannot be disabled");
        return real->Disable(key_);
    }
    const auto& current = EnterNetstack("Disable", key_);
    if (key_ == kDefaultNetstack) {
        throw HostCtlException("The default netstack instance " + Quoted(key_) + " cannot be disabled");
    }
    if (std::string users = InterfacesOf(key_); !users.empty()) {
        throw HostCtlException("Netstack instance " + Quoted(key_) +
                               " cannot be disabled while Tarkon interfaces use it: " + users);
    }
    if (current.state != Model::kNetstackEnabled) return;
    // The kernel instance goes, and its run-time tables with it.
    DropStackEntry<Model::NeighborsSection>(key_);
    DropStackEntry<Model::ConnectionsSection>(key_);
    auto& netstack = *Lib::Write<Model::NetstacksSection>().Find(key_);
    netstack.state = Model::kNetstackConfigured;
    netstack.currentMaxConnections = 0;
    netstack.currentIpv6Enabled = false;
}

// ---------------------------------------------------------------- NetworkInfoImpl

void NetworkInfoImpl::AddNetstackInstance(HostCtl::Network::NetstackInstance* instance, bool disabled) {
    auto* impl = dynamic_cast<NetstackInstanceImpl*>(instance);
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::AddNetstackInstance", impl ? impl->key_ : std::string(),
               Lib::Args(disabled));
    if (!impl || !impl->pending_) throw HostCtlException("No new netstack instance was given to add");

    const auto& pending = *impl->pending_;
    const std::string& key = impl->key_;
    CheckKey(key);
    if (pending.kind != NetstackInstanceImpl::KIND_TCPIP)
        throw HostCtlException("Unsupported kind of netstack instance " + std::to_string(pending.kind));
    CheckName(pending.name);
    CheckMaxConnections(pending.maxConnections);
    CheckAlgorithm(pending.algorithm);
    if (auto* real = RealNetstacks()) {
        if (real->Find(key)) throw HostCtlException("Netstack instance " + Quoted(key) + " already exists");
        Backend::NetstackSettings settings;
        settings.maxConnections = static_cast<std::uint32_t>(pending.maxConnections);
        settings.congestionControl = pending.algorithm;
        settings.ipv6Enabled = pending.ipv6Enabled;
        real->Add(key, pending.name, settings, disabled);
        impl->pending_.reset();
        return;
    }
    if (Lib::Read<Model::NetstacksSection>().Find(key))
        throw HostCtlException("Netstack instance " + Quoted(key) + " already exists");

    Model::Netstack netstack;
    netstack.key = key;
    netstack.name = pending.name;
    netstack.maxConnections = static_cast<std::uint32_t>(pending.maxConnections);
    netstack.congestionControl = pending.algorithm;
    netstack.ipv6Enabled = pending.ipv6Enabled;
    if (disabled) {
        netstack.state = Model::kNetstackConfigured;
        netstack.currentMaxConnections = 0;
        netstack.currentIpv6Enabled = false;
    } else {
        netstack.state = Model::kNetstackEnabled;
        netstack.currentMaxConnections = netstack.maxConnections;
        netstack.currentIpv6Enabled = netstack.ipv6Enabled;
    }
    Lib::Write<Model::NetstacksSection>().netstacks.push_back(std::move(netstack));
    // From now on the object stands for the netstack on the host.
    impl->pending_.reset();
}

std::vector<std::unique_ptr<HostCtl::Network::NetstackInstance>> NetworkInfoImpl::ListNetstackInstances() {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::ListNetstackInstances");
    std::vector<std::unique_ptr<HostCtl::Network::NetstackInstance>> list;
    if (auto* real = RealNetstacks()) {
        for (const auto& entry : real->List())
            list.push_back(std::unique_ptr<NetstackInstanceImpl>(new NetstackInstanceImpl(entry.key)));
        return list;
    }
    for (const auto& netstack : Lib::Read<Model::NetstacksSection>().netstacks)
        list.push_back(std::unique_ptr<NetstackInstanceImpl>(new NetstackInstanceImpl(netstack.key)));
    return list;
}

std::unique_ptr<HostCtl::Network::NetstackInstance> NetworkInfoImpl::LookupNetstackInstanceByKey(
    const std::string& key) {
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::LookupNetstackInstanceByKey", key);
    if (auto* real = RealNetstacks()) {
        if (!real->Find(key)) return nullptr;
        return std::unique_ptr<NetstackInstanceImpl>(new NetstackInstanceImpl(key));
    }
    if (!Lib::Read<Model::NetstacksSection>().Find(key)) return nullptr;
    return std::unique_ptr<NetstackInstanceImpl>(new NetstackInstanceImpl(key));
}

void NetworkInfoImpl::RemoveNetstackInstance(const std::string& key, bool force) {
    // force: accepted; the same rules hold either way.
    Lib::Enter("TknCtl::Network::NetworkInfoImpl::RemoveNetstackInstance", key, Lib::Args(force));
    if (auto* real = RealNetstacks()) {
        RealNetstack(*real, key);
        if (key == kDefaultNetstack)
            throw HostCtlException("The default netstack instance " + Quoted(key) + " cannot be removed");
        return real->Remove(key, force);
    }
    if (!Lib::Read<Model::NetstacksSection>().Find(key)) NoSuchNetstack(key);
    if (key == kDefaultNetstack)
        throw HostCtlException("The default netstack instance " + Quoted(key) + " cannot be removed");
    if (std::string users = InterfacesOf(key); !users.empty()) {
        throw HostCtlException("Netstack instance " + Quoted(key) +
                               " cannot be removed while Tarkon interfaces use it: " + users);
    }
    // What refers to the netstack goes first: each section is checked against the netstacks
    // when it is opened, so it must be opened while the netstack is still there.
    DropStackEntry<Model::RoutesSection>(key);
    DropStackEntry<Model::DnsSection>(key);
    DropStackEntry<Model::NeighborsSection>(key);
    DropStackEntry<Model::ConnectionsSection>(key);
    auto& netstacks = Lib::Write<Model::NetstacksSection>().netstacks;
    netstacks.erase(std::remove_if(netstacks.begin(), netstacks.end(),
                                   [&](const Model::Netstack& n) { return n.key == key; }),
                    netstacks.end());
}

}  // namespace TknCtl::Network
