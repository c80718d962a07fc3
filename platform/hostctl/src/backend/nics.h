// Physical NICs of a real host.
#pragma once

namespace TknCtl::Backend {

class Nics {
public:
    virtual ~Nics();
};

}  // namespace TknCtl::Backend
