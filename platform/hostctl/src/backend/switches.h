// Virtual switches, port groups and their policies on a real host.
#pragma once

namespace TknCtl::Backend {

class Switches {
public:
    virtual ~Switches();
};

}  // namespace TknCtl::Backend
