// IPsec security associations and policies of a real host.
#pragma once

namespace TknCtl::Backend {

class Ipsec {
public:
    virtual ~Ipsec();
};

}  // namespace TknCtl::Backend
