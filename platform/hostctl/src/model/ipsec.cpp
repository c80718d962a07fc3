#include "model/ipsec.h"

#include "model/values.h"

namespace TknCtl::Model {

namespace {

using Json::In;
using Json::Node;

template <std::size_t N>
std::string Named(const In& in, const char* key, const char* const (&names)[N], const char* fallback) {
    auto member = in.OptMember(key);
    if (!member) return fallback;
    return names[Json::NameToCode(*member, names)];
}

void Load(const In& in, IpsecSection& section) {
    in.Each("sas", [&](const In& item) {
        IpsecSa sa;
        sa.name = item.Str("name");
        if (auto a = item.OptMember("source")) sa.source = ReadIpv6(*a);
        if (auto a = item.OptMember("destination")) sa.destination = ReadIpv6(*a);
        sa.state = Named(item, "state", kSaStates, "mature");
        sa.spi = item.Int<std::uint32_t>("spi", 0);
        sa.mode = Named(item, "mode", kIpsecModes, "transport");
        sa.encryptionAlgorithm = Named(item, "encryptionAlgorithm", kEncryptionAlgorithms, "null");
        sa.integrityAlgorithm = Named(item, "integrityAlgorithm", kIntegrityAlgorithms, "hmac-sha1");
        sa.encryptionKey = item.Str("encryptionKey", "");
        sa.integrityKey = item.Str("integrityKey", "");
        sa.lifetime = item.Int<std::uint32_t>("lifetime", 0);
        sa.automatic = item.Bool("automatic", false);
        item.Done();
        section.sas.push_back(std::move(sa));
    });
    in.Each("sps", [&](const In& item) {
        IpsecSp sp;
        sp.name = item.Str("name");
        sp.saName = item.Str("saName", "");
        if (auto n = item.OptMember("source")) sp.source = ReadIpv6Network(*n);
        sp.sourcePort = item.Int<std::uint32_t>("sourcePort", 0);
        if (auto n = item.OptMember("destination")) sp.destination = ReadIpv6Network(*n);
        sp.destinationPort = item.Int<std::uint32_t>("destinationPort", 0);
        sp.protocol = Named(item, "protocol", kUpperLayerProtocols, "any");
        sp.direction = Named(item, "direction", kDirections, "out");
        sp.action = Named(item, "action", kActions, "ipsec");
        sp.mode = Named(item, "mode", kIpsecModes, "transport");
        item.Done();
        section.sps.push_back(std::move(sp));
    });
    in.Done();
}

Node Save(const IpsecSection& section) {
    Node sas = Node::array();
    for (const auto& sa : section.sas) {
        sas.push_back({{"name", sa.name},
                       {"source", sa.source.GetStringAddress()},
                       {"destination", sa.destination.GetStringAddress()},
                       {"state", sa.state},
                       {"spi", sa.spi},
                       {"mode", sa.mode},
                       {"encryptionAlgorithm", sa.encryptionAlgorithm},
                       {"integrityAlgorithm", sa.integrityAlgorithm},
                       {"encryptionKey", sa.encryptionKey},
                       {"integrityKey", sa.integrityKey},
                       {"lifetime", sa.lifetime},
                       {"automatic", sa.automatic}});
    }
    Node sps = Node::array();
    for (const auto& sp : section.sps) {
        sps.push_back({{"name", sp.name},
                       {"saName", sp.saName},
                       {"source", sp.source.GetStringAddress()},
                       {"sourcePort", sp.sourcePort},
                       {"destination", sp.destination.GetStringAddress()},
                       {"destinationPort", sp.destinationPort},
                       {"protocol", sp.protocol},
                       {"direction", sp.direction},
                       {"action", sp.action},
                       {"mode", sp.mode}});
    }
    return Node{{"sas", std::move(sas)}, {"sps", std::move(sps)}};
}

void Check(const IpsecSection& section, Lib::Checker& checker) {
    std::vector<const IpsecSa*> named;
    for (const auto& sa : section.sas) {
        if (!sa.automatic) named.push_back(&sa);
    }
    RequireUnique(
        named, [](const IpsecSa* sa) { return sa->name; }, checker, "SA name");
    RequireUnique(
        section.sps, [](const IpsecSp& sp) { return sp.name; }, checker, "SP name");
    RequireUnique(
        section.sas,
        [](const IpsecSa& sa) {
            return sa.source.GetStringAddress() + " " + sa.destination.GetStringAddress() + " " +
                   std::to_string(sa.spi);
        },
        checker, "SA source, destination and SPI");
    // An SP names an SA of its own, none (chosen automatically) or "UNKNOWN" (its SA was removed).
    for (const auto& sp : section.sps) {
        if (sp.saName.empty() || sp.saName == "UNKNOWN") continue;
        bool found = false;
        for (const auto* sa : named)
            found = found || sa->name == sp.saName;
        if (!found) checker.Fail("SP " + Lib::Quote(sp.name) + " names unknown SA " + Lib::Quote(sp.saName));
    }
}

}  // namespace

const Lib::SectionKind& IpsecSection::Kind() {
    static const Json::JsonSection<IpsecSection> kind("ipsec", Load, Save, Check);
    return kind;
}

}  // namespace TknCtl::Model
