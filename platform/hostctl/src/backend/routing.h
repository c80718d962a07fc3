// Routes and neighbours of a real host's netstacks.
#pragma once

namespace TknCtl::Backend {

class Routing {
public:
    virtual ~Routing();
};

}  // namespace TknCtl::Backend
