// IPsec of the host's Tarkon stack (IPv6): security associations (SAs) and security policies
// (SPs), their records, the enumerations they use and the configuration object.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "hostctl/lib/object.h"
#include "hostctl/network/types.h"

namespace HostCtl::Network {

// Each enumeration indexes its name table in TknCtl::Network::IpSecConfigImpl.
enum IpSecSaState : std::uint32_t {  // SA_STATE
    IPSEC_SA_STATE_LARVAL = 0,
    IPSEC_SA_STATE_MATURE = 1,
    IPSEC_SA_STATE_DYING = 2,
    IPSEC_SA_STATE_DEAD = 3,
};
enum IpSecMode : std::uint32_t {  // SA_MODE
    IPSEC_MODE_TRANSPORT = 0,
    IPSEC_MODE_TUNNEL = 1,
};
enum IpSecEncryptAlgo : std::uint32_t {  // SA_ENCPT_ALG
    IPSEC_ENCRYPT_NULL = 0,
    IPSEC_ENCRYPT_3DES_CBC = 1,
    IPSEC_ENCRYPT_AES128_CBC = 2,
};
enum IpSecAuthAlgo : std::uint32_t {  // SA_AUTH_ALG
    IPSEC_AUTH_HMAC_SHA1 = 0,
    IPSEC_AUTH_HMAC_SHA2_256 = 1,
};
enum IpSecULProtoType : std::uint32_t {  // SP_UL_PROTO_TYPE
    IPSEC_PROTO_ANY = 0,
    IPSEC_PROTO_TCP = 1,
    IPSEC_PROTO_UDP = 2,
    IPSEC_PROTO_ICMP6 = 3,
};
enum IpSecDirection : std::uint32_t {  // SP_DIRECTION
    IPSEC_DIRECTION_IN = 0,
    IPSEC_DIRECTION_OUT = 1,
};
enum IpSecAction : std::uint32_t {  // SP_ACTION
    IPSEC_ACTION_NONE = 0,
    IPSEC_ACTION_DISCARD = 1,
    IPSEC_ACTION_IPSEC = 2,
};

// A security association. Keys are text: "0x" followed by hexadecimal digits (exactly
// twice as many as the algorithm's key has bytes), or printable ASCII.
struct IpSecSadParam {
    std::string name;
    IpSecSaState state = IPSEC_SA_STATE_MATURE;
    std::uint32_t lifetime = 0;  // seconds; 0 infinite
    std::uint32_t spi = 0;
    Ipv6Address source;  // :: for any
    Ipv6Address destination;
    IpSecMode mode = IPSEC_MODE_TRANSPORT;
    IpSecEncryptAlgo encryptionAlgorithm = IPSEC_ENCRYPT_NULL;
    IpSecAuthAlgo integrityAlgorithm = IPSEC_AUTH_HMAC_SHA1;
    std::string encryptionKey;  // empty with the null algorithm
    std::string integrityKey;
};

// A security policy. An empty SA name lets the stack choose an SA; "UNKNOWN" stands for a
// named SA that was removed since.
struct IpSecSpdParam {
    std::string spName;
    std::string saName;
    Ipv6Address sourceAddress;  // ::/0 for any
    std::uint32_t sourcePrefixLength = 0;
    Ipv6Address destinationAddress;
    std::uint32_t destinationPrefixLength = 0;
    std::uint32_t sourcePort = 0;  // 0 any
    std::uint32_t destinationPort = 0;
    IpSecULProtoType protocol = IPSEC_PROTO_ANY;
    IpSecDirection direction = IPSEC_DIRECTION_OUT;
    IpSecAction action = IPSEC_ACTION_IPSEC;
    IpSecMode mode = IPSEC_MODE_TRANSPORT;
};

}  // namespace HostCtl::Network

namespace TknCtl::Network {

// The IPsec configuration. Every operation throws HostCtl::Lib::HostCtlException with a
// message saying what is wrong.
class IpSecConfigImpl : public TknCtl::Lib::TknCtlObject {
public:
    IpSecConfigImpl();
    ~IpSecConfigImpl() override;

    // The SA name that SPs report once their SA has been removed.
    static const char* const UNKNOWN_SA_NAME;

    // Name tables, indexed by the enumeration values.
    static const std::vector<std::string> SA_STATE;          // larval, mature, dying, dead
    static const std::vector<std::string> SA_MODE;           // transport, tunnel
    static const std::vector<std::string> SA_ENCPT_ALG;      // null, 3des-cbc, aes128-cbc
    static const std::vector<std::string> SA_AUTH_ALG;       // hmac-sha1, hmac-sha2-256
    static const std::vector<std::string> SP_UL_PROTO_TYPE;  // any, tcp, udp, icmp6
    static const std::vector<std::string> SP_DIRECTION;      // in, out
    static const std::vector<std::string> SP_ACTION;         // none, discard, ipsec

    // Converters from the names of the tables above. An empty text gives the default:
    // transport, null, hmac-sha1, any, out and ipsec. Any other text that is not a name of
    // the table is refused.
    HostCtl::Network::IpSecMode StringToIpSecMode(std::string text) const;
    HostCtl::Network::IpSecEncryptAlgo StringToIpSecEncyptAlgo(std::string text) const;
    HostCtl::Network::IpSecAuthAlgo StringToIpSecAuthAlgo(std::string text) const;
    HostCtl::Network::IpSecULProtoType StringToIpSecULProtoType(std::string text) const;
    HostCtl::Network::IpSecDirection StringToIpSecDirection(std::string text) const;
    HostCtl::Network::IpSecAction StringToIpSecAction(std::string text) const;

    // Security associations. A new SA is mature. Its name must be new and may not be "auto"
    // or "UNKNOWN"; source, destination and SPI must differ from every other SA's; SPIs 0
    // to 255 are reserved; keys must suit the algorithms.
    void AddSADConfig(const HostCtl::Network::IpSecSadParam& sa);
    // Replaces out by every SA in the host's order; keys are never reported (left empty).
    void GetSADConfigList(std::vector<HostCtl::Network::IpSecSadParam>& out) const;
    // Removes the SA of that name (not an automatic one); the SPs that used it report the
    // SA name "UNKNOWN" from then on.
    void RemoveSADConfig(std::string name);
    // Removes the automatic SA with the record's source, destination and SPI.
    void RemoveAutoSADConfig(const HostCtl::Network::IpSecSadParam& sa);
    // Removes every SA, automatic ones included.
    void FlushSADConfig();

    // Security policies. The name must be new; the SA name empty or that of an existing SA
    // (not an automatic one); ports from 0 to 65535, both 0 with "icmp6".
    void AddSPDConfig(const HostCtl::Network::IpSecSpdParam& sp);
    // Replaces out by every SP in the host's order.
    void GetSPDConfigList(std::vector<HostCtl::Network::IpSecSpdParam>& out) const;
    void RemoveSPDConfig(std::string name);
    void FlushSPDConfig();
};

}  // namespace TknCtl::Network
