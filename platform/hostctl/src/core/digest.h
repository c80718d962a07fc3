// Digests of the sections of a state document: a fast 64-bit hash of a section's bytes,
// written into the document beside the sections, so that a reader can tell a section this
// library wrote from one that was edited (or damaged) outside it without parsing either.
//
// Not a cryptographic hash: it guards against accidents (a hand edit, a damaged disk), not
// against someone who forges a document; bytes changed, added or moved change the digest
// with the odds of a 64-bit hash. The value depends only on the bytes: the same on every
// machine, whatever its byte order and whether or not vector instructions are used.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace TknCtl::Lib {

std::uint64_t Digest(std::string_view bytes);

// The same digest taken piece by piece, for a reader that goes through the bytes anyway:
// while they are still in the processor's caches.
class Digester {
public:
    static constexpr std::size_t kBlock = 64;

    Digester();
    // The next bytes; their number must be a multiple of kBlock.
    void AddBlocks(std::string_view blocks);
    // The digest of everything added and then rest (of any length).
    std::uint64_t Finish(std::string_view rest) const;

private:
    std::uint64_t sum_[8];
    std::uint64_t key_[8];
    std::uint64_t length_ = 0;
};

// The digest as written in a document: 16 lowercase hexadecimal digits.
std::string DigestText(std::uint64_t digest);
// The digest of such text; nothing when it is not 16 hexadecimal digits.
std::optional<std::uint64_t> ParseDigest(std::string_view text);

}  // namespace TknCtl::Lib
