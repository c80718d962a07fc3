// Physical NICs: counters, register and EEPROM images, EEPROM writes, self test and the
// restart of auto-negotiation.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>

#include "backend/nics.h"
#include "core/hook.h"
#include "core/section.h"
#include "hostctl/exception.h"
#include "hostctl/network/nic.h"
#include "model/pnics.h"

namespace TknCtl::Network {

using HostCtl::Lib::HostCtlException;
namespace Net = HostCtl::Network;

namespace {

const Model::Pnic& Enter(const char* operation, const std::string& name, const std::string& arguments = {}) {
    Lib::Enter(std::string("HostCtl::Network::Pnic::") + operation, name, arguments);
    return Model::ReadPnic(name);
}

// The real host's NICs, when the session manages one.
Backend::Nics* Real(const char* operation, const std::string& name) {
    return Backend::EnterRealNics(std::string("HostCtl::Network::Pnic::") + operation, name);
}

void Require(const Model::Pnic& nic, const char* feature, const char* what) {
    if (!Model::Supports(nic, feature))
        throw HostCtlException(nic.name + " does not support " + what + " (driver " + nic.driver.name + ")");
}

std::string Hex(std::uint64_t value) {
    char text[24];
    std::snprintf(text, sizeof text, "0x%llx", static_cast<unsigned long long>(value));
    return text;
}

std::string Size(const Model::Pnic& nic) {
    return "the EEPROM of " + nic.name + " (" + std::to_string(nic.eeprom.data.size()) + " bytes)";
}

void RequireMagic(const Model::Pnic& nic, std::int64_t magic) {
    if (magic != static_cast<std::int64_t>(nic.eeprom.magic))
        throw HostCtlException("Wrong magic key " + std::to_string(magic) + " for " + Size(nic));
}

// Closes a file descriptor when it leaves scope.
struct Descriptor {
    int fd = -1;
    ~Descriptor() {
        if (fd >= 0) ::close(fd);
    }
};

// The content of a regular file of at most limit bytes. Symbolic links, devices, pipes and
// larger files are refused; at most limit + 1 bytes are ever read.
std::vector<std::uint8_t> ReadBoundedFile(const std::string& path, std::size_t limit,
                                          const std::string& target) {
    if (path.empty()) throw HostCtlException("No EEPROM file given");
    Descriptor file;
    // O_NONBLOCK: opening a FIFO must not wait for a writer; it is refused below anyway.
    file.fd = ::open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC | O_NOCTTY);
    if (file.fd < 0) {
        const int error = errno;
        if (error == ELOOP)
            throw HostCtlException("Cannot use EEPROM file " + path + ": it is a symbolic link");
        throw HostCtlException("Cannot open EEPROM file " + path + ": " + std::strerror(error));
    }
    struct stat info {};
    if (::fstat(file.fd, &info) != 0)
        throw HostCtlException("Cannot read EEPROM file " + path + ": " + std::strerror(errno));
    if (!S_ISREG(info.st_mode))
        throw HostCtlException("Cannot use EEPROM file " + path + ": not a regular file");
    const auto tooLarge = [&](unsigned long long size) {
        return HostCtlException("EEPROM file " + path + " (" + std::to_string(size) +
                                " bytes) is larger than " + target);
    };
    if (static_cast<unsigned long long>(info.st_size) > limit) throw tooLarge(info.st_size);
    std::vector<std::uint8_t> content(limit + 1);
    std::size_t got = 0;
    while (got < content.size()) {
        const ssize_t n = ::read(file.fd, content.data() + got, content.size() - got);
        if (n < 0) {
            if (errno == EINTR) continue;
            throw HostCtlException("Cannot read EEPROM file " + path + ": " + std::strerror(errno));
        }
        if (n == 0) break;
        got += static_cast<std::size_t>(n);
    }
    if (got > limit) throw tooLarge(got);  // the file grew while it was read
    content.resize(got);
    return content;
}

}  // namespace

// ---------------------------------------------------------------- counters

void PnicImpl::GetPnicStats(Net::PnicStats& stats) const {
    if (auto* nics = Backend::EnterRealNics("TknCtl::Network::PnicImpl::GetPnicStats", name_))
        return nics->GetStats(name_, stats);
    Lib::Enter("TknCtl::Network::PnicImpl::GetPnicStats", name_);
    const auto& s = Model::ReadPnic(name_).stats;
    stats.rxPackets = s.rxPackets;
    stats.txPackets = s.txPackets;
    stats.rxBytes = s.rxBytes;
    stats.txBytes = s.txBytes;
    stats.rxDropped = s.rxDropped;
    stats.txDropped = s.txDropped;
    stats.rxMulticast = s.rxMulticast;
    stats.rxBroadcast = s.rxBroadcast;
    stats.txMulticast = s.txMulticast;
    stats.txBroadcast = s.txBroadcast;
    stats.rxErrors = s.rxErrors;
    stats.rxLengthErrors = s.rxLengthErrors;
    stats.rxOverErrors = s.rxOverErrors;
    stats.rxCrcErrors = s.rxCrcErrors;
    stats.rxFrameErrors = s.rxFrameErrors;
    stats.rxFifoErrors = s.rxFifoErrors;
    stats.rxMissedErrors = s.rxMissedErrors;
    stats.txErrors = s.txErrors;
    stats.txAbortedErrors = s.txAbortedErrors;
    stats.txCarrierErrors = s.txCarrierErrors;
    stats.txFifoErrors = s.txFifoErrors;
    stats.txHeartbeatErrors = s.txHeartbeatErrors;
    stats.txWindowErrors = s.txWindowErrors;
}

// ---------------------------------------------------------------- registers and EEPROM

void PnicImpl::GetRegisterDump(std::vector<std::uint8_t>& bytes) const {
    if (auto* nics = Real("GetRegisterDump", name_)) return nics->GetRegisterDump(name_, bytes);
    const auto& nic = Enter("GetRegisterDump", name_);
    Require(nic, "registers", "register dumps");
    bytes = nic.registers;
}

void PnicImpl::GetEepromDump(std::vector<std::uint8_t>& bytes, std::int64_t length,
                             std::int64_t offset) const {
    if (auto* nics = Real("GetEepromDump", name_)) return nics->GetEepromDump(name_, bytes, length, offset);
    const auto& nic =
        Enter("GetEepromDump", name_,
              Lib::Args("offset=" + std::to_string(offset), "length=" + std::to_string(length)));
    Require(nic, "eeprom", "EEPROM access");
    const auto& data = nic.eeprom.data;
    if (offset < 0 || static_cast<std::uint64_t>(offset) >= data.size())
        throw HostCtlException("Offset " + std::to_string(offset) + " is outside " + Size(nic));
    if (length < 0) throw HostCtlException("Invalid EEPROM length " + std::to_string(length));
    const std::uint64_t available = data.size() - static_cast<std::uint64_t>(offset);
    const std::uint64_t count =
        length == 0 ? available : std::min<std::uint64_t>(available, static_cast<std::uint64_t>(length));
    bytes.assign(data.begin() + offset, data.begin() + offset + static_cast<std::int64_t>(count));
}

void PnicImpl::SetEepromValue(std::int64_t magic, std::int64_t offset, std::int64_t value) {
    if (auto* nics = Real("SetEepromValue", name_)) {
        if (value < 0 || value > 0xffffffffLL)
            throw HostCtlException("EEPROM value " + std::to_string(value) +
                                   " does not fit in a double word");
        const std::uint32_t size = nics->BeginEepromWrite(name_, magic);
        if (offset < 0 || offset > static_cast<std::int64_t>(size) - 4) {
            throw HostCtlException("Offset " + std::to_string(offset) + " is outside the EEPROM of " + name_ +
                                   " (" + std::to_string(size) + " bytes): a double word needs 4 bytes");
        }
        std::vector<std::uint8_t> word(4);
        for (int i = 0; i < 4; ++i)
            word[static_cast<std::size_t>(i)] = static_cast<std::uint8_t>((value >> (8 * i)) & 0xff);
        return nics->WriteEeprom(name_, magic, offset, word);
    }
    const auto& nic =
        Enter("SetEepromValue", name_, Lib::Args("offset=" + std::to_string(offset), "value=" + Hex(value)));
    Require(nic, "eeprom", "EEPROM access");
    RequireMagic(nic, magic);
    const auto size = static_cast<std::int64_t>(nic.eeprom.data.size());
    if (offset < 0 || offset > size - 4) {
        throw HostCtlException("Offset " + std::to_string(offset) + " is outside " + Size(nic) +
                               ": a double word needs 4 bytes");
    }
    if (value < 0 || value > 0xffffffffLL)
        throw HostCtlException("EEPROM value " + std::to_string(value) + " does not fit in a double word");
    auto& data = Model::WritePnic(name_).eeprom.data;
    for (int i = 0; i < 4; ++i)
        data[static_cast<std::size_t>(offset + i)] = static_cast<std::uint8_t>((value >> (8 * i)) & 0xff);
}

void PnicImpl::SetEepromFromFile(std::int64_t magic, const std::string& file) {
    if (auto* nics = Real("SetEepromFromFile", name_)) {
        const std::uint32_t size = nics->BeginEepromWrite(name_, magic);
        const auto content =
            ReadBoundedFile(file, size, "the EEPROM of " + name_ + " (" + std::to_string(size) + " bytes)");
        if (content.empty()) throw HostCtlException("EEPROM file " + file + " is empty");
        return nics->WriteEeprom(name_, magic, 0, content);
    }
    const auto& nic = Enter("SetEepromFromFile", name_, file);
    Require(nic, "eeprom", "EEPROM access");
    RequireMagic(nic, magic);
    const auto content = ReadBoundedFile(file, nic.eeprom.data.size(), Size(nic));
    if (content.empty()) throw HostCtlException("EEPROM file " + file + " is empty");
    auto& data = Model::WritePnic(name_).eeprom.data;
    std::copy(content.begin(), content.end(), data.begin());
}

// ---------------------------------------------------------------- self test and negotiation

void PnicImpl::RunSelfTest(Net::PnicSelfTestResult& result, bool online) {
    if (auto* nics = Real("RunSelfTest", name_)) return nics->RunSelfTest(name_, result, online);
    const auto& nic = Enter("RunSelfTest", name_, online ? "online" : "offline");
    Require(nic, "selfTest", "self tests");
    const auto& report = online ? nic.selfTest.online : nic.selfTest.offline;
    result.failed = report.failed;
    result.info.clear();
    // The link test reports the link as it is now.
    for (auto line : report.info) {
        if (line.rfind("Link test", 0) == 0) {
            const auto colon = line.rfind(": ");
            if (colon != std::string::npos) {
                line = line.substr(0, colon + 2) + (nic.linkUp ? "passed" : "failed");
                if (!nic.linkUp) result.failed = true;
            }
        }
        result.info.push_back(line);
    }
}

void PnicImpl::RestartNegotiation() {
    if (auto* nics = Real("RestartNegotiation", name_)) return nics->RestartNegotiation(name_);
    const auto& nic = Enter("RestartNegotiation", name_);
    if (!nic.settings.autoNegotiation) {
        throw HostCtlException("Auto-negotiation is off on " + name_ +
                               ": there is no negotiation to restart (a speed and duplex are forced)");
    }
    if (!nic.adminUp) throw HostCtlException(name_ + " is down: bring it up to negotiate its link");
    auto& changed = Model::WritePnic(name_);
    Model::Renegotiate(changed);
}

}  // namespace TknCtl::Network
