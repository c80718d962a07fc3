// libFuzzer target: the state document loader. Any bytes given as a state document are
// either refused with StateFileError or accepted; an accepted document, written back in the
// canonical form, is accepted again, its digests hold, and it writes back to the same text.
#include <cstddef>
#include <cstdint>
#include <string>

#include "core/store.h"
#include "hostctl/exception.h"
#include "hostctl/session.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using HostCtl::Lib::HostSession;
    using HostCtl::Lib::StateFileError;
    const std::string text(reinterpret_cast<const char*>(data), size);

    // What a command does: scan the document, then parse sections as they are used.
    std::string canonical;
    try {
        TknCtl::Lib::Store store(text, "fuzz");
        static_cast<void>(store.Verify());
        store.LoadAll();
        store.RewriteAll();
        canonical = store.Export();
    } catch (const StateFileError& e) {
        if (std::string(e.what()).rfind("fuzz: ", 0) != 0) __builtin_trap();  // names its origin
        return 0;
    }
    // What hadrosim import does with it.
    try {
        HostSession::ValidateDocument(text, "fuzz");
    } catch (const StateFileError&) {
        __builtin_trap();  // accepted above, refused here
    }
    try {
        TknCtl::Lib::Store again(canonical, "canonical");
        if (!again.Verify()) __builtin_trap();  // written with digests that do not hold
        again.LoadAll();
        again.RewriteAll();
        if (again.Export() != canonical) __builtin_trap();
    } catch (const StateFileError&) {
        __builtin_trap();  // the library wrote a document it cannot read
    }
    return 0;
}
