#include "hostctl/exception.h"

namespace HostCtl {

const std::string emptyString;

namespace Lib {

HostCtlException::~HostCtlException() = default;

}  // namespace Lib
}  // namespace HostCtl
