// Section "ipsec": IPv6 IPsec security associations and policies of the Tarkon stack.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "core/section.h"
#include "hostctl/network/types.h"

namespace TknCtl::Model {

// The names the enumerated values are stored under.
inline const char* const kSaStates[] = {"larval", "mature", "dying", "dead"};
inline const char* const kIpsecModes[] = {"transport", "tunnel"};
inline const char* const kEncryptionAlgorithms[] = {"null", "3des-cbc", "aes128-cbc"};
inline const char* const kIntegrityAlgorithms[] = {"hmac-sha1", "hmac-sha2-256"};
inline const char* const kUpperLayerProtocols[] = {"any", "tcp", "udp", "icmp6"};
inline const char* const kDirections[] = {"in", "out"};
inline const char* const kActions[] = {"none", "discard", "ipsec"};

struct IpsecSa {
    std::string name;
    HostCtl::Network::Ipv6Address source;  // :: for any
    HostCtl::Network::Ipv6Address destination;
    std::string state = "mature";
    std::uint32_t spi = 0;
    std::string mode = "transport";
    std::string encryptionAlgorithm = "null";
    std::string integrityAlgorithm = "hmac-sha1";
    std::string encryptionKey;
    std::string integrityKey;
    std::uint32_t lifetime = 0;  // seconds; 0 infinite
    bool automatic = false;      // created by key exchange, removed by source, destination and SPI
};

struct IpsecSp {
    std::string name;
    std::string saName;  // empty: chosen automatically; may name an SA that was removed
    HostCtl::Network::Ipv6Network source;
    std::uint32_t sourcePort = 0;  // 0 any
    HostCtl::Network::Ipv6Network destination;
    std::uint32_t destinationPort = 0;
    std::string protocol = "any";
    std::string direction = "out";
    std::string action = "ipsec";
    std::string mode = "transport";
};

struct IpsecSection {
    static const Lib::SectionKind& Kind();
    std::vector<IpsecSa> sas;
    std::vector<IpsecSp> sps;
};

}  // namespace TknCtl::Model
