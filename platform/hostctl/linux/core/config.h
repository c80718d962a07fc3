// The Linux host's configuration: /etc/hadro/linux.conf, or the file $HADRO_LINUX_CONF names.
//
//     # interfaces that count as physical NICs besides those backed by a device in sysfs
//     nics = eth* ens3 uplink?
//     # the host's own document
//     state = /var/lib/hadro/linux.json
//
// "key = value" lines; blank lines and lines starting with '#' are ignored. A missing file
// means the defaults; an unknown key or a malformed line is refused with its line number.
#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace TknCtl::Linux {

struct Config {
    static constexpr const char* kDefaultPath = "/etc/hadro/linux.conf";
    static constexpr const char* kDefaultState = "/var/lib/hadro/linux.json";

    std::string origin;             // the file read; empty when there was none
    std::vector<std::string> nics;  // names or shell patterns
    std::string statePath;          // the host's own document

    // Reads $HADRO_LINUX_CONF (else the default path); $HADRO_LINUX_STATE wins over the file's
    // "state". Throws HostCtl::Lib::StateFileError naming the file, the line and the fault.
    static Config Load();
    // Reads a configuration's text; origin names it in messages.
    static Config Parse(std::string_view text, const std::string& origin);

    // Whether the configuration counts the interface of that name as a physical NIC.
    bool NamesNic(const std::string& name) const;
};

}  // namespace TknCtl::Linux
