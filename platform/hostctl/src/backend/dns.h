// The resolver configuration of a real host's netstacks.
#pragma once

#include <string>
#include <vector>

namespace TknCtl::Backend {

class Dns {
public:
    virtual ~Dns();
    // The name servers in use order and the search domains in search order of a netstack;
    // throws HostCtlException for a netstack the host does not have.
    virtual void Read(const std::string& netstack, std::vector<std::string>& servers,
                      std::vector<std::string>& searchDomains) = 0;
    // Stores them (the checks of the operations have passed); throws HostCtlException when the
    // host cannot store them, saying why.
    virtual void Write(const std::string& netstack, const std::vector<std::string>& servers,
                       const std::vector<std::string>& searchDomains) = 0;
};

}  // namespace TknCtl::Backend
