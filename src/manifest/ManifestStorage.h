#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <new>
#include <string_view>
#include <vector>

#include "core/BlockArray.h"

// The memory of a manifest. A million files must load into a 32-bit host, whose address space is fragmented: nothing
// here grows by copying, no block is much above 1 MB, and no entry has a heap block of its own.
namespace tavi::storage {

// MurmurHash3 for 32 bits with two differences, which shorten it: the length is part of the seed, and each of the last
// bytes is mixed as a word.
constexpr std::uint32_t hashBytes(std::uint32_t seed, std::string_view bytes) noexcept
{
    std::uint32_t hash = seed ^ static_cast<std::uint32_t>(bytes.size());
    const auto mix = [&hash](std::uint32_t word) {
        word *= 0xCC9E2D51u;
        word = (word << 15) | (word >> 17);
        hash ^= word * 0x1B873593u;
        hash = ((hash << 13) | (hash >> 19)) * 5 + 0xE6546B64u;
    };
    const auto byteAt = [&bytes](std::size_t i) {
        return static_cast<std::uint32_t>(static_cast<unsigned char>(bytes[i]));
    };
    std::size_t at = 0;
    for (; at + 4 <= bytes.size(); at += 4)
        mix(byteAt(at) | byteAt(at + 1) << 8 | byteAt(at + 2) << 16 | byteAt(at + 3) << 24);
    for (; at < bytes.size(); ++at)
        mix(byteAt(at));
    hash = (hash ^ (hash >> 16)) * 0x85EBCA6Bu;
    hash = (hash ^ (hash >> 13)) * 0xC2B2AE35u;
    return hash ^ (hash >> 16);
}

// Immutable byte strings, each with a 32-bit reference: block number and offset.
class ByteArena {
  public:
    using Ref = std::uint32_t;

    Ref append(std::string_view bytes)
    {
        // The length comes first, in unsigned LEB128.
        char head[10];
        std::size_t headSize = 0;
        std::size_t rest = bytes.size();
        for (; rest >= 0x80; rest >>= 7)
            head[headSize++] = static_cast<char>(0x80 | (rest & 0x7F));
        head[headSize++] = static_cast<char>(rest);

        const std::size_t need = headSize + bytes.size();
        if (need > kBlockBytes)
            return write(addBlock(need), 0, {head, headSize}, bytes);
        if (blocks_.empty() || kBlockBytes - used_ < need) {
            current_ = addBlock(kBlockBytes);
            used_ = 0;
        }
        const auto offset = static_cast<std::uint32_t>(used_);
        used_ += need;
        return write(current_, offset, {head, headSize}, bytes);
    }
    std::string_view at(Ref ref) const noexcept
    {
        const char* from = blocks_[ref >> kOffsetBits].get() + (ref & ((1u << kOffsetBits) - 1));
        std::size_t size = 0;
        for (unsigned shift = 0;; shift += 7) {
            const auto byte = static_cast<unsigned char>(*from++);
            size |= static_cast<std::size_t>(byte & 0x7F) << shift;
            if (byte < 0x80)
                return {from, size};
        }
    }
    std::size_t bytes() const noexcept
    {
        return bytes_;
    }

  private:
    static constexpr unsigned kOffsetBits = 20;
    // Leaves room for the heap's header, so that a block fills a whole number of pages.
    static constexpr std::size_t kBlockBytes = (std::size_t{1} << kOffsetBits) - 64;

    std::uint32_t addBlock(std::size_t size)
    {
        if (blocks_.size() >> (32 - kOffsetBits) != 0)
            throw std::bad_alloc();
        blocks_.emplace_back(new char[size]);
        bytes_ += size;
        return static_cast<std::uint32_t>(blocks_.size() - 1);
    }
    Ref write(std::uint32_t block, std::uint32_t offset, std::string_view head, std::string_view bytes) noexcept
    {
        char* to = blocks_[block].get() + offset;
        std::memcpy(to, head.data(), head.size());
        if (!bytes.empty())
            std::memcpy(to + head.size(), bytes.data(), bytes.size());
        return block << kOffsetBits | offset;
    }

    std::vector<std::unique_ptr<char[]>> blocks_;
    std::uint32_t current_ = 0;
    std::size_t used_ = kBlockBytes;
    std::size_t bytes_ = 0;
};

// A hash table, with open addressing, over the numbers of elements that are stored elsewhere and numbered from 0.
class HashIndex {
  public:
    static constexpr std::uint32_t kNone = 0xFFFFFFFF;

    // Empties the index and makes room for so many elements.
    void allocate(std::uint32_t elements)
    {
        std::uint32_t slots = 16;
        while (slots / 2 < elements)
            slots *= 2;
        mask_ = slots - 1;
        slots_ = {};
        slots_.allocate(slots);
        slots_.fill(kNone);
        size_ = 0;
    }
    // Adds the next element; hashOf(number) returns the hash of each so far.
    template <class HashOf>
    void push(HashOf hashOf)
    {
        const std::uint32_t elements = size_ + 1;
        if (elements > slots_.size() / 2)
            allocate(elements);
        for (; size_ < elements; ++size_) {
            std::uint32_t slot = hashOf(size_) & mask_;
            while (slots_[slot] != kNone)
                slot = (slot + 1) & mask_;
            slots_[slot] = size_;
        }
    }
    // Returns the first number of this hash that `matches` accepts, or kNone.
    template <class Matches>
    std::uint32_t find(std::uint32_t hash, Matches matches) const
    {
        if (slots_.size() == 0)
            return kNone;
        for (std::uint32_t slot = hash & mask_;; slot = (slot + 1) & mask_) {
            if (slots_[slot] == kNone || matches(slots_[slot]))
                return slots_[slot];
        }
    }
    std::size_t bytes() const noexcept
    {
        return slots_.bytes();
    }

  private:
    BlockArray<std::uint32_t, 18> slots_;
    std::uint32_t mask_ = 0;
    std::uint32_t size_ = 0;
};

// One version of one file. Nearly every aux text is 40 hexadecimal digits, which fit in `digest`, and nearly every
// other aux value is 0. For any other version `digest` begins with the arena reference of its Extra.
struct PackedVersion {
    std::uint32_t timestamp;
    std::uint32_t modifiedTime;
    std::uint32_t ctime;
    std::uint32_t attributes;
    std::uint32_t sizeLow;
    std::uint32_t sizeHigh;
    unsigned char digest[20];
};
static_assert(sizeof(PackedVersion) == 44);

// Precedes the aux text in the arena string of a version that does not fit.
struct Extra {
    std::int64_t aux1;
    std::int64_t aux2;
};

// All versions of all files, in the order of the text.
class VersionStore {
  public:
    std::uint32_t size() const noexcept
    {
        return versions_.size();
    }
    const PackedVersion& operator[](std::uint32_t i) const noexcept
    {
        return versions_[i];
    }
    bool hasExtra(std::uint32_t i) const noexcept
    {
        return (extras_[i / 32] >> (i % 32) & 1) != 0;
    }
    // After an exception the version may be added again.
    void push(const PackedVersion& version, bool extra = false)
    {
        const std::uint32_t i = size();
        if (i / 32 == extras_.size())
            extras_.push(0);
        versions_.push(version);
        extras_[i / 32] |= std::uint32_t{extra} << (i % 32);
    }
    std::size_t bytes() const noexcept
    {
        return versions_.bytes() + extras_.bytes();
    }

  private:
    BlockArray<PackedVersion, 14> versions_;
    // One bit for each version.
    BlockArray<std::uint32_t, 9> extras_;
};

} // namespace tavi::storage
