#include "hostctl/util.h"

#include "core/hook.h"

namespace TknCtl::Util {

int TknCtl_Exec(const std::string& command, bool, bool, bool) {
    return Lib::TryEnter("TknCtl::Util::TknCtl_Exec", {}, command) ? 1 : 0;
}

}  // namespace TknCtl::Util
