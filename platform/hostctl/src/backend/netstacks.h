// Netstack instances of a real host, its global IP settings, connections and multicast groups.
#pragma once

namespace TknCtl::Backend {

class Netstacks {
public:
    virtual ~Netstacks();
};

}  // namespace TknCtl::Backend
