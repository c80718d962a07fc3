// The hook every host-control operation begins with.
//
//     void DnsConfigImpl::SaveConfig() {
//         Lib::Enter("TknCtl::Network::DnsConfigImpl::SaveConfig", netstack_);
//         ...
//     }
//
// Enter appends "OPERATION TARGET ARGUMENTS" to the journal when it is on (empty parts left
// out), then asks the fault table: the first fault naming this operation (and this target,
// when the fault names one) makes the call fail with HostCtlException(message) and uses up
// one of its count. The operation is named by its declaring type and the operation, the
// target is the name of the entity the call is made on ("vmnic1", "vSwitch0", a netstack
// key), the arguments are what identifies the request, joined with Args(). With no session
// open, Enter throws HostCtlException("no host session is open").
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <type_traits>

namespace TknCtl::Lib {

void Enter(std::string_view operation, std::string_view target = {}, std::string_view arguments = {});

// The same, for operations that report failure by their result: returns the fault's
// message instead of throwing (nothing when the call may go on).
std::optional<std::string> TryEnter(std::string_view operation, std::string_view target = {},
                                    std::string_view arguments = {});

// Whether the current session is a dry run (HostSession::StartDryRun), and the recording of
// its lines: a call as the journal words it, or a real host's kernel request. last ends the
// recording until the lines are next taken (the dry run went as far as it could).
bool DryRun();
void RecordDryRun(std::string line, bool last = false);

namespace Detail {
inline std::string ArgText(std::string_view value) {
    return std::string(value);
}
inline std::string ArgText(const char* value) {
    return value ? value : "";
}
inline std::string ArgText(const std::string& value) {
    return value;
}
inline std::string ArgText(bool value) {
    return value ? "true" : "false";
}
template <class T>
std::enable_if_t<std::is_integral_v<T> && !std::is_same_v<T, bool>, std::string> ArgText(T value) {
    return std::to_string(value);
}
}  // namespace Detail

// The arguments as journal text: each one as text (booleans as true/false), separated by
// single blanks; empty texts are left out.
template <class... A>
std::string Args(const A&... arguments) {
    std::string out;
    auto add = [&out](std::string text) {
        if (text.empty()) return;
        if (!out.empty()) out += ' ';
        out += text;
    };
    (add(Detail::ArgText(arguments)), ...);
    return out;
}

}  // namespace TknCtl::Lib
