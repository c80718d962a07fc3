// The one exception type of the host-control library.
#pragma once

#include <exception>
#include <string>

namespace HostCtl {

// An empty string, used as a default argument.
extern const std::string emptyString;

namespace Lib {

// A host-control operation failed; the message says what is wrong.
class HostCtlException : public std::exception {
public:
    explicit HostCtlException(const char* message) : message_(message ? message : "") {}
    explicit HostCtlException(std::string message) : message_(std::move(message)) {}
    ~HostCtlException() override;
    const char* what() const noexcept override { return message_.c_str(); }
    const std::string& GetMessage() const noexcept { return message_; }

private:
    std::string message_;
};

}  // namespace Lib
}  // namespace HostCtl
