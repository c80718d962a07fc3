// IP interfaces of a real host: their addresses, gateways, IPv6 settings and tags.
#pragma once

namespace TknCtl::Backend {

class Interfaces {
public:
    virtual ~Interfaces();
};

}  // namespace TknCtl::Backend
