#pragma once

#include <utility>

namespace tavi {

// One reference to an object that counts its own by AddRef and Release. Not shared between threads; the object may be.
template <class Object>
class Reference {
  public:
    Reference() noexcept = default;
    // Takes over a reference that the caller has.
    explicit Reference(Object* adopted) noexcept : object_(adopted) {}
    Reference(const Reference& other) noexcept : object_(other.object_)
    {
        if (object_)
            object_->AddRef();
    }
    Reference(Reference&& other) noexcept : object_(other.release()) {}
    Reference& operator=(Reference other) noexcept
    {
        std::swap(object_, other.object_);
        return *this;
    }
    ~Reference()
    {
        if (object_)
            object_->Release();
    }

    Object* get() const noexcept
    {
        return object_;
    }
    Object* operator->() const noexcept
    {
        return object_;
    }
    Object& operator*() const noexcept
    {
        return *object_;
    }
    explicit operator bool() const noexcept
    {
        return object_ != nullptr;
    }
    // The reference is the caller's.
    Object* release() noexcept
    {
        return std::exchange(object_, nullptr);
    }

  private:
    Object* object_ = nullptr;
};

} // namespace tavi
