// A program that also loads the framework and the host-control library, as hadrocli does,
// and uses one thing of each; it loads no plug-in and reads no state.
#include <iostream>

#include "hostctl/session.h"
#include "zorbel/formatter.h"

int main() {
    std::cout << Zorbel::Format::IsFormatter("table") << ' ' << HostCtl::Lib::ResolveStatePath("/dev/null")
              << '\n';
    return 0;
}
