#pragma once

#include <cstdint>

namespace tavi {

// The growable block that carries one frame. Counted without atomics: a buffer never leaves the thread that made it.
class MessageBuffer {
  public:
    // Made with no reference; its first holder takes one at once.
    MessageBuffer() noexcept;
    MessageBuffer(const MessageBuffer&) = delete;
    MessageBuffer& operator=(const MessageBuffer&) = delete;

    void AddRef() noexcept
    {
        ++refs_;
    }
    // Frees block and buffer with the last reference.
    void Release() noexcept;

    // Makes room for `size` bytes. When that fails the old block is gone too and data() is null.
    void ensure(std::uint32_t size) noexcept;

    // Every byte up to capacity() may be read; those that nobody wrote are 0. Null after a failed growth.
    unsigned char* data() const noexcept
    {
        return data_;
    }
    std::uint32_t capacity() const noexcept
    {
        return capacity_;
    }
    // The bytes in use, as announced: it may be larger than what was delivered, and larger than the capacity.
    std::uint32_t length() const noexcept
    {
        return length_;
    }
    void setLength(std::uint32_t length) noexcept
    {
        length_ = length;
    }

  private:
    ~MessageBuffer();
    void grow(std::uint32_t capacity) noexcept;

    unsigned char* data_ = nullptr;
    std::uint32_t capacity_ = 0;
    std::uint32_t length_ = 0;
    std::uint32_t refs_ = 0;
};

// A new buffer and the first reference to it.
class HeldBuffer {
  public:
    HeldBuffer() : buffer_(new MessageBuffer)
    {
        buffer_->AddRef();
    }
    HeldBuffer(const HeldBuffer&) = delete;
    HeldBuffer& operator=(const HeldBuffer&) = delete;
    ~HeldBuffer()
    {
        buffer_->Release();
    }
    MessageBuffer& operator*() const noexcept
    {
        return *buffer_;
    }
    MessageBuffer* operator->() const noexcept
    {
        return buffer_;
    }

  private:
    MessageBuffer* buffer_;
};

} // namespace tavi
