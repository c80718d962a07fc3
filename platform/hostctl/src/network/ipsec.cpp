// IPsec security associations and policies.
#include "hostctl/network/ipsec.h"

#include <algorithm>
#include <cctype>
#include <cstdio>
#include <iterator>

#include "backend/host.h"
#include "backend/ipsec.h"
#include "core/hook.h"
#include "core/section.h"
#include "hostctl/exception.h"
#include "model/ipsec.h"

namespace TknCtl::Network {

using HostCtl::Lib::HostCtlException;
namespace Net = HostCtl::Network;

namespace {

template <std::size_t N>
std::vector<std::string> Table(const char* const (&names)[N]) {
    return {std::begin(names), std::end(names)};
}

}  // namespace

const char* const IpSecConfigImpl::UNKNOWN_SA_NAME = "UNKNOWN";

const std::vector<std::string> IpSecConfigImpl::SA_STATE = Table(Model::kSaStates);
const std::vector<std::string> IpSecConfigImpl::SA_MODE = Table(Model::kIpsecModes);
const std::vector<std::string> IpSecConfigImpl::SA_ENCPT_ALG = Table(Model::kEncryptionAlgorithms);
const std::vector<std::string> IpSecConfigImpl::SA_AUTH_ALG = Table(Model::kIntegrityAlgorithms);
const std::vector<std::string> IpSecConfigImpl::SP_UL_PROTO_TYPE = Table(Model::kUpperLayerProtocols);
const std::vector<std::string> IpSecConfigImpl::SP_DIRECTION = Table(Model::kDirections);
const std::vector<std::string> IpSecConfigImpl::SP_ACTION = Table(Model::kActions);

namespace {

const char* const kOperation = "TknCtl::Network::IpSecConfigImpl::";
const char* const kAutoSaName = "auto";
constexpr std::size_t kMaxNameLength = 64;
constexpr std::uint32_t kMaxPort = 65535;
constexpr std::uint32_t kFirstSpi = 0x100;  // 0 to 0xff are reserved

void Enter(const char* operation, const std::string& target = {}, const std::string& args = {}) {
    Lib::Enter(std::string(kOperation) + operation, target, args);
}

std::string Quoted(const std::string& text) {
    return "'" + text + "'";
}

std::string Hex(std::uint32_t value) {
    char text[16];
    std::snprintf(text, sizeof text, "0x%x", value);
    return text;
}

// The names of a table as "a, b, c".
std::string Choices(const std::vector<std::string>& table) {
    std::string out;
    for (const auto& name : table) {
        out += out.empty() ? "" : ", ";
        out += name;
    }
    return out;
}

// The index of text in table; empty text gives fallback; other texts are refused.
std::uint32_t FromText(const std::string& text, const std::vector<std::string>& table, std::uint32_t fallback,
                       const char* what) {
    if (text.empty()) return fallback;
    for (std::size_t i = 0; i < table.size(); ++i) {
        if (table[i] == text) return static_cast<std::uint32_t>(i);
    }
    throw HostCtlException("Unknown " + std::string(what) + " " + Quoted(text) + ": use one of " +
                           Choices(table));
}

// The name of an enumeration value; values outside the table are refused.
const std::string& ToText(std::uint32_t value, const std::vector<std::string>& table, const char* what) {
    if (value >= table.size())
        throw HostCtlException("Invalid " + std::string(what) + " value " + std::to_string(value));
    return table[value];
}

// The index a stored name has in its table (the model keeps only names of the table).
std::uint32_t Index(const std::string& name, const std::vector<std::string>& table) {
    auto it = std::find(table.begin(), table.end(), name);
    return it == table.end() ? 0 : static_cast<std::uint32_t>(it - table.begin());
}

void CheckName(const std::string& name, const char* what) {
    bool ok = !name.empty() && name.size() <= kMaxNameLength;
    for (char c : name) {
        if (static_cast<unsigned char>(c) <= 0x20 || c == 0x7f) ok = false;
    }
    if (!ok) {
        throw HostCtlException("Invalid " + std::string(what) + " name " + Quoted(name) +
                               ": a name is 1 to " + std::to_string(kMaxNameLength) +
                               " printable characters without blanks");
    }
}

// Key sizes in bytes.
std::size_t EncryptionKeyBytes(Net::IpSecEncryptAlgo algorithm) {
    switch (algorithm) {
        case Net::IPSEC_ENCRYPT_3DES_CBC:
            return 24;
        case Net::IPSEC_ENCRYPT_AES128_CBC:
            return 16;
        default:
            return 0;
    }
}

std::size_t IntegrityKeyBytes(Net::IpSecAuthAlgo algorithm) {
    return algorithm == Net::IPSEC_AUTH_HMAC_SHA2_256 ? 32 : 20;
}

// A key: "0x" and exactly 2 * bytes hexadecimal digits, or printable ASCII text.
void CheckKey(const std::string& key, std::size_t bytes, const std::string& algorithm, const char* what) {
    if (key.empty()) throw HostCtlException("Missing " + std::string(what) + " key for " + algorithm);
    if (key.size() >= 2 && key[0] == '0' && (key[1] == 'x' || key[1] == 'X')) {
        std::string digits = key.substr(2);
        bool hex = std::all_of(digits.begin(), digits.end(),
                               [](char c) { return std::isxdigit(static_cast<unsigned char>(c)) != 0; });
        if (!hex) {
            throw HostCtlException("Invalid hex " + std::string(what) +
                                   " key: only hexadecimal digits may follow 0x");
        }
        if (digits.size() != 2 * bytes) {
            throw HostCtlException("Invalid hex " + std::string(what) + " key for " + algorithm +
                                   ": it needs " + std::to_string(2 * bytes) + " hexadecimal digits (" +
                                   std::to_string(bytes * 8) + " bits), not " +
                                   std::to_string(digits.size()));
        }
        return;
    }
    for (char c : key) {
        if (static_cast<unsigned char>(c) < 0x20 || static_cast<unsigned char>(c) > 0x7e) {
            throw HostCtlException("Invalid " + std::string(what) +
                                   " key: an ASCII key holds printable characters only");
        }
    }
}

const Model::IpsecSa* FindNamedSa(const Model::IpsecSection& ipsec, const std::string& name) {
    for (const auto& sa : ipsec.sas) {
        if (!sa.automatic && sa.name == name) return &sa;
    }
    return nullptr;
}

// SPs that name a removed SA keep the name "UNKNOWN".
void OrphanPolicies(Model::IpsecSection& ipsec, const std::string& saName) {
    for (auto& sp : ipsec.sps) {
        if (!sp.saName.empty() && (saName.empty() || sp.saName == saName))
            sp.saName = IpSecConfigImpl::UNKNOWN_SA_NAME;
    }
}

// The messages of the duplicate and existence checks, shared by both hosts.
std::string SaExists(const std::string& name) {
    return "Security Association " + Quoted(name) + " already exists";
}
std::string SaNotFound(const std::string& name) {
    return "Security Association " + Quoted(name) + " does not exist";
}
std::string SaSameKey(const std::string& name, const Net::IpSecSadParam& sa) {
    return "Security Association " + Quoted(name) + " already has source " + sa.source.GetStringAddress() +
           ", destination " + sa.destination.GetStringAddress() + " and SPI " + Hex(sa.spi);
}
std::string NoAutoSa(const Net::IpSecSadParam& sa) {
    return "No automatic Security Association has source " + sa.source.GetStringAddress() + ", destination " +
           sa.destination.GetStringAddress() + " and SPI " + Hex(sa.spi);
}

// A real host names the associations it made without a name "auto".
bool IsNamedOnRealHost(const Net::IpSecSadParam& sa, const std::string& name) {
    return sa.name == name && sa.name != kAutoSaName;
}

}  // namespace

IpSecConfigImpl::IpSecConfigImpl() = default;
IpSecConfigImpl::~IpSecConfigImpl() = default;

// ---------------------------------------------------------------- converters

Net::IpSecMode IpSecConfigImpl::StringToIpSecMode(std::string text) const {
    Enter("StringToIpSecMode", {}, text);
    return static_cast<Net::IpSecMode>(FromText(text, SA_MODE, Net::IPSEC_MODE_TRANSPORT, "IPsec mode"));
}

Net::IpSecEncryptAlgo IpSecConfigImpl::StringToIpSecEncyptAlgo(std::string text) const {
    Enter("StringToIpSecEncyptAlgo", {}, text);
    return static_cast<Net::IpSecEncryptAlgo>(
        FromText(text, SA_ENCPT_ALG, Net::IPSEC_ENCRYPT_NULL, "encryption algorithm"));
}

Net::IpSecAuthAlgo IpSecConfigImpl::StringToIpSecAuthAlgo(std::string text) const {
    Enter("StringToIpSecAuthAlgo", {}, text);
    return static_cast<Net::IpSecAuthAlgo>(
        FromText(text, SA_AUTH_ALG, Net::IPSEC_AUTH_HMAC_SHA1, "integrity algorithm"));
}

Net::IpSecULProtoType IpSecConfigImpl::StringToIpSecULProtoType(std::string text) const {
    Enter("StringToIpSecULProtoType", {}, text);
    return static_cast<Net::IpSecULProtoType>(
        FromText(text, SP_UL_PROTO_TYPE, Net::IPSEC_PROTO_ANY, "upper layer protocol"));
}

Net::IpSecDirection IpSecConfigImpl::StringToIpSecDirection(std::string text) const {
    Enter("StringToIpSecDirection", {}, text);
    return static_cast<Net::IpSecDirection>(
        FromText(text, SP_DIRECTION, Net::IPSEC_DIRECTION_OUT, "flow direction"));
}

Net::IpSecAction IpSecConfigImpl::StringToIpSecAction(std::string text) const {
    Enter("StringToIpSecAction", {}, text);
    return static_cast<Net::IpSecAction>(FromText(text, SP_ACTION, Net::IPSEC_ACTION_IPSEC, "policy action"));
}

// ---------------------------------------------------------------- security associations

void IpSecConfigImpl::AddSADConfig(const Net::IpSecSadParam& sa) {
    // Keys stay out of the journal.
    Enter("AddSADConfig", sa.name,
          Lib::Args(sa.source.GetStringAddress(), sa.destination.GetStringAddress(), Hex(sa.spi)));
    CheckName(sa.name, "Security Association");
    if (sa.name == kAutoSaName || sa.name == UNKNOWN_SA_NAME) {
        throw HostCtlException("The Security Association name " + Quoted(sa.name) + " is reserved");
    }
    if (sa.spi < kFirstSpi) {
        throw HostCtlException("SPI " + Hex(sa.spi) + " is reserved: an SPI is from " + Hex(kFirstSpi) +
                               " to 0xffffffff");
    }
    const std::string& mode = ToText(sa.mode, SA_MODE, "IPsec mode");
    const std::string& encryption = ToText(sa.encryptionAlgorithm, SA_ENCPT_ALG, "encryption algorithm");
    const std::string& integrity = ToText(sa.integrityAlgorithm, SA_AUTH_ALG, "integrity algorithm");
    if (sa.encryptionAlgorithm == Net::IPSEC_ENCRYPT_NULL) {
        if (!sa.encryptionKey.empty())
            throw HostCtlException("The null encryption algorithm takes no encryption key");
    } else {
        CheckKey(sa.encryptionKey, EncryptionKeyBytes(sa.encryptionAlgorithm), encryption, "encryption");
    }
    CheckKey(sa.integrityKey, IntegrityKeyBytes(sa.integrityAlgorithm), integrity, "integrity");

    if (auto* host = Lib::RealHost()) {
        auto& area = host->GetIpsec();
        for (const auto& other : area.ListSas(false)) {
            if (IsNamedOnRealHost(other, sa.name)) throw HostCtlException(SaExists(sa.name));
            if (other.source == sa.source && other.destination == sa.destination && other.spi == sa.spi)
                throw HostCtlException(SaSameKey(other.name, sa));
        }
        return area.AddSa(sa);
    }
    const auto& ipsec = Lib::Read<Model::IpsecSection>();
    if (FindNamedSa(ipsec, sa.name)) throw HostCtlException(SaExists(sa.name));
    for (const auto& other : ipsec.sas) {
        if (other.source == sa.source && other.destination == sa.destination && other.spi == sa.spi)
            throw HostCtlException(SaSameKey(other.name, sa));
    }

    Model::IpsecSa stored;
    stored.name = sa.name;
    stored.source = sa.source;
    stored.destination = sa.destination;
    stored.state = SA_STATE[Net::IPSEC_SA_STATE_MATURE];
    stored.spi = sa.spi;
    stored.mode = mode;
    stored.encryptionAlgorithm = encryption;
    stored.integrityAlgorithm = integrity;
    stored.encryptionKey = sa.encryptionKey;
    stored.integrityKey = sa.integrityKey;
    stored.lifetime = sa.lifetime;
    Lib::Write<Model::IpsecSection>().sas.push_back(std::move(stored));
}

void IpSecConfigImpl::GetSADConfigList(std::vector<Net::IpSecSadParam>& out) const {
    Enter("GetSADConfigList");
    if (auto* host = Lib::RealHost()) {
        out = host->GetIpsec().ListSas(true);
        return;
    }
    out.clear();
    for (const auto& sa : Lib::Read<Model::IpsecSection>().sas) {
        Net::IpSecSadParam param;
        param.name = sa.name;
        param.state = static_cast<Net::IpSecSaState>(Index(sa.state, SA_STATE));
        param.lifetime = sa.lifetime;
        param.spi = sa.spi;
        param.source = sa.source;
        param.destination = sa.destination;
        param.mode = static_cast<Net::IpSecMode>(Index(sa.mode, SA_MODE));
        param.encryptionAlgorithm =
            static_cast<Net::IpSecEncryptAlgo>(Index(sa.encryptionAlgorithm, SA_ENCPT_ALG));
        param.integrityAlgorithm = static_cast<Net::IpSecAuthAlgo>(Index(sa.integrityAlgorithm, SA_AUTH_ALG));
        out.push_back(std::move(param));
    }
}

void IpSecConfigImpl::RemoveSADConfig(std::string name) {
    Enter("RemoveSADConfig", name);
    if (auto* host = Lib::RealHost()) {
        auto& area = host->GetIpsec();
        auto sas = area.ListSas(false);
        if (std::none_of(sas.begin(), sas.end(), [&](const auto& sa) { return IsNamedOnRealHost(sa, name); }))
            throw HostCtlException(SaNotFound(name));
        return area.RemoveSa(name);
    }
    if (!FindNamedSa(Lib::Read<Model::IpsecSection>(), name)) throw HostCtlException(SaNotFound(name));
    auto& ipsec = Lib::Write<Model::IpsecSection>();
    ipsec.sas.erase(
        std::remove_if(ipsec.sas.begin(), ipsec.sas.end(),
                       [&](const Model::IpsecSa& sa) { return !sa.automatic && sa.name == name; }),
        ipsec.sas.end());
    OrphanPolicies(ipsec, name);
}

void IpSecConfigImpl::RemoveAutoSADConfig(const Net::IpSecSadParam& sa) {
    Enter("RemoveAutoSADConfig", {},
          Lib::Args(sa.source.GetStringAddress(), sa.destination.GetStringAddress(), Hex(sa.spi)));
    if (auto* host = Lib::RealHost()) {
        auto& area = host->GetIpsec();
        auto sas = area.ListSas(false);
        if (std::none_of(sas.begin(), sas.end(), [&](const Net::IpSecSadParam& s) {
                return s.name == kAutoSaName && s.source == sa.source && s.destination == sa.destination &&
                       s.spi == sa.spi;
            }))
            throw HostCtlException(NoAutoSa(sa));
        return area.RemoveAutoSa(sa.source, sa.destination, sa.spi);
    }
    auto matches = [&](const Model::IpsecSa& s) {
        return s.automatic && s.source == sa.source && s.destination == sa.destination && s.spi == sa.spi;
    };
    const auto& sas = Lib::Read<Model::IpsecSection>().sas;
    if (std::none_of(sas.begin(), sas.end(), matches)) throw HostCtlException(NoAutoSa(sa));
    auto& list = Lib::Write<Model::IpsecSection>().sas;
    list.erase(std::remove_if(list.begin(), list.end(), matches), list.end());
}

void IpSecConfigImpl::FlushSADConfig() {
    Enter("FlushSADConfig");
    if (auto* host = Lib::RealHost()) return host->GetIpsec().FlushSas();
    if (Lib::Read<Model::IpsecSection>().sas.empty()) return;
    auto& ipsec = Lib::Write<Model::IpsecSection>();
    ipsec.sas.clear();
    OrphanPolicies(ipsec, {});
}

// ---------------------------------------------------------------- security policies

void IpSecConfigImpl::AddSPDConfig(const Net::IpSecSpdParam& sp) {
    Enter("AddSPDConfig", sp.spName,
          Lib::Args(
              sp.saName, sp.sourceAddress.GetStringAddress() + "/" + std::to_string(sp.sourcePrefixLength),
              sp.destinationAddress.GetStringAddress() + "/" + std::to_string(sp.destinationPrefixLength)));
    CheckName(sp.spName, "Security Policy");
    const std::string& protocol = ToText(sp.protocol, SP_UL_PROTO_TYPE, "upper layer protocol");
    const std::string& direction = ToText(sp.direction, SP_DIRECTION, "flow direction");
    const std::string& action = ToText(sp.action, SP_ACTION, "policy action");
    const std::string& mode = ToText(sp.mode, SA_MODE, "IPsec mode");
    for (auto [port, what] :
         {std::pair{sp.sourcePort, "Source"}, std::pair{sp.destinationPort, "Destination"}}) {
        if (port > kMaxPort) {
            throw HostCtlException(std::string(what) + " port " + std::to_string(port) +
                                   " is out of range: a port is from 0 to 65535 (0 for any)");
        }
    }
    if (sp.protocol == Net::IPSEC_PROTO_ICMP6 && (sp.sourcePort != 0 || sp.destinationPort != 0))
        throw HostCtlException("ICMPv6 has no ports: give 0 (any) for both ports with icmp6");
    // The constructors refuse prefix lengths above 128.
    Net::Ipv6Network source(sp.sourceAddress, sp.sourcePrefixLength);
    Net::Ipv6Network destination(sp.destinationAddress, sp.destinationPrefixLength);

    if (auto* host = Lib::RealHost()) {
        auto& area = host->GetIpsec();
        for (const auto& other : area.ListSps(false)) {
            if (other.spName == sp.spName)
                throw HostCtlException("Security Policy " + Quoted(sp.spName) + " already exists");
        }
        if (!sp.saName.empty()) {
            auto sas = area.ListSas(false);
            if (std::none_of(sas.begin(), sas.end(),
                             [&](const auto& sa) { return IsNamedOnRealHost(sa, sp.saName); }))
                throw HostCtlException(SaNotFound(sp.saName));
        }
        return area.AddSp(sp);
    }
    const auto& ipsec = Lib::Read<Model::IpsecSection>();
    for (const auto& other : ipsec.sps) {
        if (other.name == sp.spName)
            throw HostCtlException("Security Policy " + Quoted(sp.spName) + " already exists");
    }
    if (!sp.saName.empty() && !FindNamedSa(ipsec, sp.saName)) throw HostCtlException(SaNotFound(sp.saName));

    Model::IpsecSp stored;
    stored.name = sp.spName;
    stored.saName = sp.saName;
    stored.source = source;
    stored.sourcePort = sp.sourcePort;
    stored.destination = destination;
    stored.destinationPort = sp.destinationPort;
    stored.protocol = protocol;
    stored.direction = direction;
    stored.action = action;
    stored.mode = mode;
    Lib::Write<Model::IpsecSection>().sps.push_back(std::move(stored));
}

void IpSecConfigImpl::GetSPDConfigList(std::vector<Net::IpSecSpdParam>& out) const {
    Enter("GetSPDConfigList");
    if (auto* host = Lib::RealHost()) {
        out = host->GetIpsec().ListSps(true);
        return;
    }
    out.clear();
    for (const auto& sp : Lib::Read<Model::IpsecSection>().sps) {
        Net::IpSecSpdParam param;
        param.spName = sp.name;
        param.saName = sp.saName;
        param.sourceAddress = sp.source.GetAddress();
        param.sourcePrefixLength = sp.source.GetNetmask();
        param.destinationAddress = sp.destination.GetAddress();
        param.destinationPrefixLength = sp.destination.GetNetmask();
        param.sourcePort = sp.sourcePort;
        param.destinationPort = sp.destinationPort;
        param.protocol = static_cast<Net::IpSecULProtoType>(Index(sp.protocol, SP_UL_PROTO_TYPE));
        param.direction = static_cast<Net::IpSecDirection>(Index(sp.direction, SP_DIRECTION));
        param.action = static_cast<Net::IpSecAction>(Index(sp.action, SP_ACTION));
        param.mode = static_cast<Net::IpSecMode>(Index(sp.mode, SA_MODE));
        out.push_back(std::move(param));
    }
}

void IpSecConfigImpl::RemoveSPDConfig(std::string name) {
    Enter("RemoveSPDConfig", name);
    const std::string notFound = "Security Policy " + Quoted(name) + " does not exist";
    if (auto* host = Lib::RealHost()) {
        auto& area = host->GetIpsec();
        auto sps = area.ListSps(false);
        if (std::none_of(sps.begin(), sps.end(), [&](const auto& sp) { return sp.spName == name; }))
            throw HostCtlException(notFound);
        return area.RemoveSp(name);
    }
    const auto& sps = Lib::Read<Model::IpsecSection>().sps;
    auto named = [&](const Model::IpsecSp& sp) { return sp.name == name; };
    if (std::none_of(sps.begin(), sps.end(), named)) throw HostCtlException(notFound);
    auto& list = Lib::Write<Model::IpsecSection>().sps;
    list.erase(std::remove_if(list.begin(), list.end(), named), list.end());
}

void IpSecConfigImpl::FlushSPDConfig() {
    Enter("FlushSPDConfig");
    if (auto* host = Lib::RealHost()) return host->GetIpsec().FlushSps();
    if (Lib::Read<Model::IpsecSection>().sps.empty()) return;
    Lib::Write<Model::IpsecSection>().sps.clear();
}

}  // namespace TknCtl::Network
