// The command classes of Tarkon network interfaces: "network ip interface ...", and the steps
// several of them share.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "frame/command.h"
#include "hostctl/network/tknnic.h"

namespace TalvexCli::NetworkNamespace {

// ---------------------------------------------------------------- interfaces

class IpInterfaceList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpInterfaceList)
public:
    virtual std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

class IpInterfaceAdd : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpInterfaceAdd)
};

class IpInterfaceRemove : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpInterfaceRemove)
};

class IpInterfaceSet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpInterfaceSet)
};

// ---------------------------------------------------------------- IPv4

// Registered as "network ip interface ipv4 get" and as "network ip interface ipv4 address list".
class IpInterfaceIpv4Get : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpInterfaceIpv4Get)
public:
    virtual std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

class IpInterfaceIpv4Set : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpInterfaceIpv4Set)
};

// ---------------------------------------------------------------- IPv6

class IpInterfaceIpv6Get : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpInterfaceIpv6Get)
public:
    virtual std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

class IpInterfaceIpv6Set : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpInterfaceIpv6Set)
};

class IpInterfaceIpv6AddressList : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpInterfaceIpv6AddressList)
public:
    virtual std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

class IpInterfaceIpv6AddressAdd : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpInterfaceIpv6AddressAdd)
};

class IpInterfaceIpv6AddressRemove : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpInterfaceIpv6AddressRemove)
};

// ---------------------------------------------------------------- tags

class IpInterfaceTagAdd : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpInterfaceTagAdd)
};

class IpInterfaceTagGet : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpInterfaceTagGet)
public:
    virtual std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

class IpInterfaceTagRemove : public virtual Zorbel::AutoCli::Command {
    NETWORK_COMMAND(IpInterfaceTagRemove)
};

// ---------------------------------------------------------------- shared steps

namespace IpInterface {

// "Unable to find a Tarkon interface with the name " (the IPv4 and IPv6 commands).
extern const char* const kNoSuchInterface;
// The description of the regular expression every interface name takes ("tkn0" to "tkn255").
extern const char* const kInterfaceNamePattern;

// The interface whose name equals name exactly, taken out of the full list; nothing when there
// is none.
std::unique_ptr<HostCtl::Network::TknNic> FindByName(const std::string& name);

// The rules between "portgroup-name", "dvs-name" and "dvport-id": adds the message and returns
// false when they are broken.
bool CheckConnectionPointRules(const Zorbel::CallSpec::Input& input, const OutputPtr& output);

// The connection point the parameters name, or nothing after a message was added. An
// IsValid() that throws is not caught.
std::unique_ptr<HostCtl::Network::ConnectionPoint> BuildConnectionPoint(const Zorbel::CallSpec::Input& input,
                                                                        const OutputPtr& output);

// The names of tag types 1 to 8, separated by ", ".
std::string SupportedTags();

// For an invalid tag name: the two messages. Returns the tag type, or 0 after the messages.
HostCtl::Network::TknNicTagType TagType(const std::string& tagName, const OutputPtr& output);

}  // namespace IpInterface
}  // namespace TalvexCli::NetworkNamespace
