#include "core/digest.h"

#include <bit>
#include <cstring>
#if defined(__SSE2__)
#include <emmintrin.h>
#endif

namespace TknCtl::Lib {

namespace {

// The bytes go through eight 64-bit lanes, 64 bytes (one word per lane) at a time. For word
// w of lane i, keyed with k (the lane's key, which grows by kStep from one block to the
// next, so that the same words elsewhere count differently):
//     x = w ^ k;   sum[i] += low32(x) * high32(x) + (the word of lane i ^ 1)
// The last block is padded with zeros; the length goes into the final mix. The products are
// what SSE2 multiplies two lanes at a time, so the vector and the plain loop agree exactly.
constexpr std::uint64_t kPrime1 = 0x9E3779B185EBCA87ULL;
constexpr std::uint64_t kPrime2 = 0xC2B2AE3D27D4EB4FULL;
constexpr std::uint64_t kPrime3 = 0x165667B19E3779F9ULL;
constexpr std::uint64_t kPrime4 = 0x85EBCA77C2B2AE63ULL;
constexpr std::uint64_t kPrime5 = 0x27D4EB2F165667C5ULL;
constexpr std::uint64_t kStep = 0x9E3779B97F4A7C15ULL;
constexpr std::uint64_t kKeys[8] = {
    0x243F6A8885A308D3ULL, 0x13198A2E03707344ULL, 0xA4093822299F31D0ULL, 0x082EFA98EC4E6C89ULL,
    0x452821E638D01377ULL, 0xBE5466CF34E90C6CULL, 0xC0AC29B7C97C50DDULL, 0x3F84D5B5B5470917ULL,
};
constexpr std::size_t kBlock = Digester::kBlock;

std::uint64_t Rotl(std::uint64_t x, int r) {
    return (x << r) | (x >> (64 - r));
}

// The little-endian word at p, on any machine.
[[maybe_unused]] std::uint64_t Word(const unsigned char* p) {
    std::uint64_t value;
    if constexpr (std::endian::native == std::endian::little) {
        std::memcpy(&value, p, sizeof value);
    } else {
        value = 0;
        for (int i = 7; i >= 0; --i)
            value = (value << 8) | p[i];
    }
    return value;
}

// Blocks [p, p + 64 * count) added to the lanes.
void MixBlocks(std::uint64_t (&sums)[8], std::uint64_t (&keys)[8], const unsigned char* p,
               std::size_t count) {
#if defined(__SSE2__)
    __m128i sum[4];
    __m128i key[4];
    for (int j = 0; j < 4; ++j) {
        sum[j] = _mm_loadu_si128(reinterpret_cast<const __m128i*>(sums + 2 * j));
        key[j] = _mm_loadu_si128(reinterpret_cast<const __m128i*>(keys + 2 * j));
    }
    const __m128i step = _mm_set1_epi64x(static_cast<long long>(kStep));
    for (std::size_t block = 0; block < count; ++block, p += kBlock) {
        for (int j = 0; j < 4; ++j) {
            const __m128i words = _mm_loadu_si128(reinterpret_cast<const __m128i*>(p + 16 * j));
            const __m128i keyed = _mm_xor_si128(words, key[j]);
            const __m128i product = _mm_mul_epu32(keyed, _mm_srli_epi64(keyed, 32));
            sum[j] = _mm_add_epi64(sum[j], _mm_add_epi64(product, _mm_shuffle_epi32(words, 0x4e)));
            key[j] = _mm_add_epi64(key[j], step);
        }
    }
    for (int j = 0; j < 4; ++j) {
        _mm_storeu_si128(reinterpret_cast<__m128i*>(sums + 2 * j), sum[j]);
        _mm_storeu_si128(reinterpret_cast<__m128i*>(keys + 2 * j), key[j]);
    }
#else
    for (std::size_t block = 0; block < count; ++block, p += kBlock) {
        std::uint64_t words[8];
        for (int i = 0; i < 8; ++i)
            words[i] = Word(p + 8 * i);
        for (int i = 0; i < 8; ++i) {
            const std::uint64_t keyed = words[i] ^ keys[i];
            sums[i] += (keyed & 0xFFFFFFFFULL) * (keyed >> 32) + words[i ^ 1];
            keys[i] += kStep;
        }
    }
#endif
}

}  // namespace

Digester::Digester() {
    for (int i = 0; i < 8; ++i) {
        sum_[i] = kKeys[7 - i];
        key_[i] = kKeys[i];
    }
}

void Digester::AddBlocks(std::string_view blocks) {
    MixBlocks(sum_, key_, reinterpret_cast<const unsigned char*>(blocks.data()), blocks.size() / kBlock);
    length_ += blocks.size();
}

std::uint64_t Digester::Finish(std::string_view rest) const {
    std::uint64_t sums[8];
    std::uint64_t keys[8];
    std::memcpy(sums, sum_, sizeof sums);
    std::memcpy(keys, key_, sizeof keys);
    const auto* data = reinterpret_cast<const unsigned char*>(rest.data());
    const std::size_t whole = rest.size() / kBlock;
    MixBlocks(sums, keys, data, whole);
    if (const std::size_t left = rest.size() % kBlock; left != 0) {
        unsigned char last[kBlock] = {};
        std::memcpy(last, data + whole * kBlock, left);
        MixBlocks(sums, keys, last, 1);
    }
    std::uint64_t h = kPrime5 + (length_ + rest.size()) * kPrime1;
    for (std::uint64_t sum : sums) {
        h ^= Rotl(sum * kPrime2, 31) * kPrime1;
        h = Rotl(h, 27) * kPrime1 + kPrime4;
    }
    h ^= h >> 33;
    h *= kPrime2;
    h ^= h >> 29;
    h *= kPrime3;
    h ^= h >> 32;
    return h;
}

std::uint64_t Digest(std::string_view bytes) {
    return Digester().Finish(bytes);
}

std::string DigestText(std::uint64_t digest) {
    static const char digits[] = "0123456789abcdef";
    std::string text(16, '0');
    for (int i = 15; i >= 0; --i, digest >>= 4)
        text[static_cast<std::size_t>(i)] = digits[digest & 0xF];
    return text;
}

std::optional<std::uint64_t> ParseDigest(std::string_view text) {
    if (text.size() != 16) return std::nullopt;
    std::uint64_t value = 0;
    for (char c : text) {
        int digit;
        if (c >= '0' && c <= '9') {
            digit = c - '0';
        } else if (c >= 'a' && c <= 'f') {
            digit = c - 'a' + 10;
        } else {
            return std::nullopt;
        }
        value = (value << 4) | static_cast<std::uint64_t>(digit);
    }
    return value;
}

}  // namespace TknCtl::Lib
