// Standard output that remembers why a write failed, so that a program can report output it
// could not deliver (a full disk, a closed pipe, /dev/full) as the core utilities do, rather
// than end with success and the output lost:
//
//     Zorbel::Output::CheckedOutput out(STDOUT_FILENO);
//     std::cout.rdbuf(&out);
//     ...
//     if (int error = out.Finish()) std::cerr << "Error: write error: " << std::strerror(error) << '\n';
//
// Header-only: programs that do not link the framework use it too.
#pragma once

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstddef>
#include <streambuf>

namespace Zorbel::Output {

class CheckedOutput : public std::streambuf {
public:
    explicit CheckedOutput(int fd) : fd_(fd) { setp(buffer_, buffer_ + sizeof buffer_); }
    CheckedOutput(const CheckedOutput&) = delete;
    CheckedOutput& operator=(const CheckedOutput&) = delete;
    ~CheckedOutput() override { Flush(); }

    // The errno of the first write that failed; 0 while everything went out. After a
    // failure nothing more is written (the stream using this buffer goes bad).
    int Error() const { return error_; }

    // Writes what is buffered and closes the descriptor (a file system may report a failed
    // write only then); returns Error(). Nothing may be written afterwards.
    int Finish() {
        Flush();
        if (fd_ >= 0) {
            if (close(fd_) != 0 && error_ == 0 && errno != EINTR) error_ = errno;
            fd_ = -1;
        }
        return error_;
    }

protected:
    int_type overflow(int_type c) override {
        if (!Flush()) return traits_type::eof();
        if (traits_type::eq_int_type(c, traits_type::eof())) return traits_type::not_eof(c);
        *pptr() = traits_type::to_char_type(c);
        pbump(1);
        return c;
    }
    std::streamsize xsputn(const char* data, std::streamsize count) override {
        const auto size = static_cast<std::size_t>(count);
        if (size <= static_cast<std::size_t>(epptr() - pptr())) {
            traits_type::copy(pptr(), data, size);
            pbump(static_cast<int>(size));
            return count;
        }
        // Long text (a whole listing) goes out at once, after what is buffered.
        if (!Flush() || !WriteAll(data, size)) return 0;
        return count;
    }
    int sync() override { return Flush() ? 0 : -1; }

private:
    bool Flush() {
        const auto size = static_cast<std::size_t>(pptr() - pbase());
        setp(buffer_, buffer_ + sizeof buffer_);
        return WriteAll(buffer_, size);
    }
    bool WriteAll(const char* data, std::size_t size) {
        if (error_ != 0) return false;
        while (size > 0) {
            const ssize_t n = fd_ >= 0 ? write(fd_, data, size) : (errno = EBADF, -1);
            if (n <= 0) {
                if (n < 0 && errno == EINTR) continue;
                error_ = n < 0 ? errno : EIO;
                return false;
            }
            data += n;
            size -= static_cast<std::size_t>(n);
        }
        return true;
    }

    int fd_;
    int error_ = 0;
    char buffer_[16384];
};

// Gives standard input, output and error that were closed when the program started a
// descriptor of /dev/null that refuses their use (reading output, writing input). Otherwise
// the next file the program opens (the lock of the state file) would take the number, and
// output meant for the terminal would go into it instead of failing.
inline void ReserveStandardDescriptors() {
    for (int fd = 0; fd <= 2; ++fd) {
        if (fcntl(fd, F_GETFD) != -1 || errno != EBADF) continue;
        const int null = open("/dev/null", (fd == 0 ? O_WRONLY : O_RDONLY) | O_CLOEXEC);
        if (null < 0 || null == fd) continue;
        dup2(null, fd);
        close(null);
    }
}

}  // namespace Zorbel::Output
