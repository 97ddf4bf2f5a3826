#pragma once

#include <cstdint>

#include "core/RefCounted.h"

namespace tavi {

// The growable block that carries one frame. The count is plain: a buffer never leaves the thread that created it.
class MessageBuffer : public RefCounted<MessageBuffer, std::uint32_t> {
  public:
    static RefPtr<MessageBuffer> create()
    {
        return RefPtr<MessageBuffer>(new MessageBuffer);
    }

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
    friend class RefCounted<MessageBuffer, std::uint32_t>;
    MessageBuffer() noexcept;
    ~MessageBuffer();
    void grow(std::uint32_t capacity) noexcept;

    unsigned char* data_ = nullptr;
    std::uint32_t capacity_ = 0;
    std::uint32_t length_ = 0;
};

} // namespace tavi
