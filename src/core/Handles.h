#pragma once

#include <utility>

#include <windows.h>
#include <objbase.h>

// One owning type per kind of system handle. Each frees what it holds when it goes, and nothing else; none is shared
// between threads.
namespace tavi {

template <class Traits>
class UniqueHandle {
  public:
    using Handle = typename Traits::Handle;

    UniqueHandle() noexcept = default;
    explicit UniqueHandle(Handle handle) noexcept : handle_(handle) {}
    UniqueHandle(UniqueHandle&& other) noexcept : handle_(other.release()) {}
    UniqueHandle& operator=(UniqueHandle&& other) noexcept
    {
        reset(other.release());
        return *this;
    }
    ~UniqueHandle()
    {
        reset();
    }

    Handle get() const noexcept
    {
        return handle_;
    }
    explicit operator bool() const noexcept
    {
        return handle_ != Traits::none();
    }
    Handle release() noexcept
    {
        return std::exchange(handle_, Traits::none());
    }
    void reset(Handle handle = Traits::none()) noexcept
    {
        if (handle_ != Traits::none())
            Traits::free(handle_);
        handle_ = handle;
    }
    // For functions that store a new handle through a pointer.
    Handle* out() noexcept
    {
        reset();
        return &handle_;
    }

  private:
    Handle handle_ = Traits::none();
};

// What stands for no handle differs from kind to kind.
template <class Type>
struct NullIsNone {
    using Handle = Type;
    static Handle none() noexcept
    {
        return nullptr;
    }
};
struct InvalidIsNone {
    using Handle = HANDLE;
    static Handle none() noexcept
    {
        return INVALID_HANDLE_VALUE;
    }
};

struct KernelTraits : NullIsNone<HANDLE> {
    static void free(Handle handle) noexcept
    {
        CloseHandle(handle);
    }
};
using KernelHandle = UniqueHandle<KernelTraits>;

struct FileTraits : InvalidIsNone {
    static void free(Handle handle) noexcept
    {
        CloseHandle(handle);
    }
};
using FileHandle = UniqueHandle<FileTraits>;

struct RegistryTraits : NullIsNone<HKEY> {
    static void free(Handle key) noexcept
    {
        RegCloseKey(key);
    }
};
using RegistryKey = UniqueHandle<RegistryTraits>;

struct LocalTextTraits : NullIsNone<LPWSTR> {
    static void free(Handle text) noexcept
    {
        LocalFree(text);
    }
};
using LocalText = UniqueHandle<LocalTextTraits>;

template <class Object>
struct GdiTraits : NullIsNone<Object> {
    static void free(Object object) noexcept
    {
        DeleteObject(object);
    }
};
using BitmapHandle = UniqueHandle<GdiTraits<HBITMAP>>;
using BrushHandle = UniqueHandle<GdiTraits<HBRUSH>>;

struct IconTraits : NullIsNone<HICON> {
    static void free(Handle icon) noexcept
    {
        DestroyIcon(icon);
    }
};
using IconHandle = UniqueHandle<IconTraits>;

struct MemoryDcTraits : NullIsNone<HDC> {
    static void free(Handle dc) noexcept
    {
        DeleteDC(dc);
    }
};
using MemoryDc = UniqueHandle<MemoryDcTraits>;

// One reference to a COM object.
template <class Interface>
class ComPtr {
  public:
    ComPtr() noexcept = default;
    // Adopts the caller's reference.
    explicit ComPtr(Interface* object) noexcept : object_(object) {}
    ComPtr(const ComPtr& other) noexcept : object_(other.object_)
    {
        if (object_)
            object_->AddRef();
    }
    ComPtr(ComPtr&& other) noexcept : object_(std::exchange(other.object_, nullptr)) {}
    ComPtr& operator=(ComPtr other) noexcept
    {
        std::swap(object_, other.object_);
        return *this;
    }
    ~ComPtr()
    {
        if (object_)
            object_->Release();
    }

    Interface* get() const noexcept
    {
        return object_;
    }
    Interface* operator->() const noexcept
    {
        return object_;
    }
    explicit operator bool() const noexcept
    {
        return object_ != nullptr;
    }
    Interface** out() noexcept
    {
        *this = ComPtr();
        return &object_;
    }
    void** outVoid() noexcept
    {
        return reinterpret_cast<void**>(out());
    }

  private:
    Interface* object_ = nullptr;
};

} // namespace tavi
