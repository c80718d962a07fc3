// The command classes of ENS contexts ("network ens ..."). They pass their parameters to the
// host unchanged and return its own result.
#pragma once

#include <memory>
#include <string>

#include "frame/command.h"

namespace TalvexCli::NetworkNamespace {

// Parameter names, shared by each command's parameter declarations and its execution.
namespace EnsParam {
inline const std::string kMaxLcores = "maxlcores";
inline const std::string kLcoreId = "lcore-id";
inline const std::string kSwitch = "switch";
inline const std::string kAffinity = "affinity";
}  // namespace EnsParam

class EnsMaxlcoresGet : public Zorbel::AutoCli::Command {
    NETWORK_COMMAND(EnsMaxlcoresGet)
};

class EnsMaxlcoresSet : public Zorbel::AutoCli::Command {
    NETWORK_COMMAND(EnsMaxlcoresSet)
};

class EnsLcoreAdd : public Zorbel::AutoCli::Command {
    NETWORK_COMMAND(EnsLcoreAdd)
};

class EnsLcoreRemove : public Zorbel::AutoCli::Command {
    NETWORK_COMMAND(EnsLcoreRemove)
};

class EnsLcoreList : public Zorbel::AutoCli::Command {
    NETWORK_COMMAND(EnsLcoreList)
public:
    std::shared_ptr<Zorbel::MetaObj::MetaStruct> GetOutputStructure();
};

class EnsLcoreSwitchGet : public Zorbel::AutoCli::Command {
    NETWORK_COMMAND(EnsLcoreSwitchGet)
};

class EnsLcoreSwitchAdd : public Zorbel::AutoCli::Command {
    NETWORK_COMMAND(EnsLcoreSwitchAdd)
};

class EnsLcoreSwitchRemove : public Zorbel::AutoCli::Command {
    NETWORK_COMMAND(EnsLcoreSwitchRemove)
};

class EnsLcoreAffinityGet : public Zorbel::AutoCli::Command {
    NETWORK_COMMAND(EnsLcoreAffinityGet)
};

class EnsLcoreAffinitySet : public Zorbel::AutoCli::Command {
    NETWORK_COMMAND(EnsLcoreAffinitySet)
};

}  // namespace TalvexCli::NetworkNamespace
