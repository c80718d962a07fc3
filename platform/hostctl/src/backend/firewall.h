// The firewall of a real host.
#pragma once

namespace TknCtl::Backend {

class Firewall {
public:
    virtual ~Firewall();
};

}  // namespace TknCtl::Backend
