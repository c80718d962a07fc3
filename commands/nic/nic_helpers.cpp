// Helpers shared by the NIC commands.
#include <limits>

#include "commands/nic/nic.h"

namespace TalvexCli::NetworkNamespace::Nic {

const char* UpDown(bool up) {
    return up ? "Up" : "Down";
}

const char* OnOff(bool on) {
    return on ? "on" : "off";
}

const char* DuplexText(std::uint32_t duplex) {
    return duplex == 1 ? "Full" : "Half";
}

std::uint32_t Uint32Parameter(const Zorbel::CallSpec::Input& input, const std::string& name) {
    const std::int64_t value = input.GetParameterInt(name);
    if (value < 0 || value > std::numeric_limits<std::uint32_t>::max()) {
        Frame::Fail("Invalid value " + std::to_string(value) + " for --" + name +
                    ": expected a number from 0 to 4294967295.");
    }
    return static_cast<std::uint32_t>(value);
}

}  // namespace TalvexCli::NetworkNamespace::Nic
