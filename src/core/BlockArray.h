#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <iterator>
#include <memory>
#include <type_traits>
#include <vector>

namespace tavi {

// An array in blocks of 2^kBlockLog2 elements, which never move: it grows without copying and needs no large contiguous
// range of the address space. Elements are trivially copyable and start uninitialized.
//
// Not std::deque, whose blocks have 512 bytes: a million records of 16 bytes would be 31,250 blocks of the heap instead
// of 16, each with its overhead, and a module that unloads would free them one by one.
template <class Element, unsigned kBlockLog2>
class BlockArray {
    static_assert(std::is_trivially_copyable_v<Element>);
    static constexpr std::size_t kBlock = std::size_t{1} << kBlockLog2;

  public:
    // For the algorithms that sort.
    class Iterator {
      public:
        // NOLINTBEGIN(readability-identifier-naming): the standard library names these.
        using iterator_category = std::random_access_iterator_tag;
        using value_type = Element;
        using difference_type = std::ptrdiff_t;
        using pointer = Element*;
        using reference = Element&;
        // NOLINTEND(readability-identifier-naming)

        Iterator(BlockArray& array, std::uint32_t at) noexcept : array_(&array), at_(at) {}
        Element& operator*() const noexcept
        {
            return (*array_)[at_];
        }
        Element* operator->() const noexcept
        {
            return &**this;
        }
        Iterator& operator++() noexcept
        {
            return *this += 1;
        }
        Iterator& operator--() noexcept
        {
            return *this += -1;
        }
        Iterator& operator+=(std::ptrdiff_t count) noexcept
        {
            at_ += static_cast<std::uint32_t>(count);
            return *this;
        }
        friend Iterator operator+(Iterator from, std::ptrdiff_t count) noexcept
        {
            return from += count;
        }
        friend Iterator operator-(Iterator from, std::ptrdiff_t count) noexcept
        {
            return from += -count;
        }
        friend std::ptrdiff_t operator-(Iterator a, Iterator b) noexcept
        {
            return static_cast<std::ptrdiff_t>(a.at_) - static_cast<std::ptrdiff_t>(b.at_);
        }
        friend bool operator==(Iterator a, Iterator b) noexcept
        {
            return a.at_ == b.at_;
        }
        friend bool operator!=(Iterator a, Iterator b) noexcept
        {
            return a.at_ != b.at_;
        }
        friend bool operator<(Iterator a, Iterator b) noexcept
        {
            return a.at_ < b.at_;
        }

      private:
        BlockArray* array_;
        std::uint32_t at_;
    };
    Iterator begin() noexcept
    {
        return {*this, 0};
    }
    Iterator end() noexcept
    {
        return {*this, size_};
    }

    std::uint32_t size() const noexcept
    {
        return size_;
    }
    const Element& operator[](std::uint32_t i) const noexcept
    {
        return blocks_[i >> kBlockLog2][i & (kBlock - 1)];
    }
    Element& operator[](std::uint32_t i) noexcept
    {
        return blocks_[i >> kBlockLog2][i & (kBlock - 1)];
    }
    void push(const Element& element)
    {
        if ((size_ & (kBlock - 1)) == 0 && size_ >> kBlockLog2 == blocks_.size())
            addBlock(kBlock);
        (*this)[size_] = element;
        ++size_;
    }
    // Gives an empty array exactly `size` elements. It must not grow afterwards.
    void allocate(std::uint32_t size)
    {
        for (std::size_t done = 0; done < size; done += kBlock)
            addBlock(std::min<std::size_t>(kBlock, size - done));
        size_ = size;
    }
    void fill(const Element& element)
    {
        for (std::uint32_t i = 0; i < size_; i += kBlock)
            std::fill_n(blocks_[i >> kBlockLog2].get(), std::min<std::size_t>(kBlock, size_ - i), element);
    }
    void shrinkTo(std::uint32_t size) noexcept
    {
        size_ = std::min(size_, size);
    }
    std::size_t bytes() const noexcept
    {
        return bytes_;
    }

  private:
    void addBlock(std::size_t elements)
    {
        blocks_.emplace_back(new Element[elements]);
        bytes_ += elements * sizeof(Element);
    }

    std::vector<std::unique_ptr<Element[]>> blocks_;
    std::uint32_t size_ = 0;
    std::size_t bytes_ = 0;
};

} // namespace tavi
