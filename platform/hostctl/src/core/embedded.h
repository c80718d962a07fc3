// The default host document, compiled into the library (generated at build time from the
// files under platform/hostctl/data/default-host/).
#pragma once

#include <cstddef>

namespace TknCtl::Lib {

extern const unsigned char kDefaultHost[];
extern const std::size_t kDefaultHostSize;

}  // namespace TknCtl::Lib
