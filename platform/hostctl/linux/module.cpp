// The entry point libhostctl looks up when it loads this module.
#include "host.h"

extern "C" __attribute__((visibility("default"))) TknCtl::Backend::Host* HostCtlLinux_OpenHost() {
    return TknCtl::Linux::OpenHost().release();
}
