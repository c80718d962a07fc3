#include "hostctl/lib/object.h"

#include "core/section.h"

namespace TknCtl::Lib {

TknCtlObject::TknCtlObject() {
    RequireSession();
}

TknCtlObject::~TknCtlObject() = default;

Refreshable::~Refreshable() = default;

}  // namespace TknCtl::Lib
