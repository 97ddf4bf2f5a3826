#include "ContentStore.h"

#include <windows.h>
#include <wincrypt.h>

#include <memory>
#include <vector>

#include "Text.h"

namespace service {
namespace {

struct HandleCloser {
    using pointer = HANDLE;
    void operator()(HANDLE handle) const
    {
        CloseHandle(handle);
    }
};
using File = std::unique_ptr<HANDLE, HandleCloser>;

File openFile(const std::wstring& path, DWORD access, DWORD share, DWORD disposition)
{
    const HANDLE handle = CreateFileW(longPath(path).c_str(), access, share, nullptr, disposition, 0, nullptr);
    if (handle == INVALID_HANDLE_VALUE)
        throw systemFailure(path, GetLastError());
    return File(handle);
}

class Sha1 {
  public:
    Sha1()
    {
        if (!CryptAcquireContextW(&provider_, nullptr, nullptr, PROV_RSA_FULL, CRYPT_VERIFYCONTEXT) ||
            !CryptCreateHash(provider_, CALG_SHA1, 0, 0, &hash_))
            throw systemFailure(L"no SHA-1", GetLastError());
    }
    Sha1(const Sha1&) = delete;
    Sha1& operator=(const Sha1&) = delete;
    ~Sha1()
    {
        CryptDestroyHash(hash_);
        CryptReleaseContext(provider_, 0);
    }
    void add(const char* bytes, DWORD size)
    {
        if (!CryptHashData(hash_, reinterpret_cast<const BYTE*>(bytes), size, 0))
            throw systemFailure(L"no SHA-1", GetLastError());
    }
    std::wstring digits()
    {
        BYTE value[20];
        DWORD size = sizeof value;
        if (!CryptGetHashParam(hash_, HP_HASHVAL, value, &size, 0))
            throw systemFailure(L"no SHA-1", GetLastError());
        std::wstring text;
        for (const BYTE byte : value) {
            text += L"0123456789abcdef"[byte >> 4];
            text += L"0123456789abcdef"[byte & 15];
        }
        return text;
    }

  private:
    HCRYPTPROV provider_ = 0;
    HCRYPTHASH hash_ = 0;
};

} // namespace

std::wstring longPath(const std::wstring& path)
{
    if (path.compare(0, 2, L"\\\\") == 0)
        return L"\\\\?\\UNC" + path.substr(1);
    return L"\\\\?\\" + path;
}

std::wstring hashOf(std::string_view bytes)
{
    Sha1 hash;
    hash.add(bytes.data(), static_cast<DWORD>(bytes.size()));
    return hash.digits();
}

ContentStore::ContentStore(std::wstring folder) : folder_(std::move(folder)) {}

std::wstring ContentStore::pathOf(const std::wstring& hash) const
{
    return folder_ + L"\\" + hash;
}

template <class Read>
ContentStore::Content ContentStore::add(Read read) const
{
    // The copy that is hashed is the copy that is kept, whatever a writer does to the file meanwhile.
    const std::wstring incoming = folder_ + L"\\incoming";
    File copy = openFile(incoming, GENERIC_WRITE, 0, CREATE_ALWAYS);
    Sha1 hash;
    Content content;
    std::vector<char> part(65536);
    while (const DWORD count = read(part.data(), static_cast<DWORD>(part.size()))) {
        DWORD written = 0;
        hash.add(part.data(), count);
        if (!WriteFile(copy.get(), part.data(), count, &written, nullptr) || written != count)
            throw systemFailure(incoming, GetLastError());
        content.size += count;
    }
    content.hash = hash.digits();
    copy.reset();
    if (!MoveFileExW(longPath(incoming).c_str(), longPath(pathOf(content.hash)).c_str(), MOVEFILE_REPLACE_EXISTING))
        throw systemFailure(incoming, GetLastError());
    return content;
}

ContentStore::Content ContentStore::addFile(const std::wstring& path) const
{
    const File source =
        openFile(path, GENERIC_READ, FILE_SHARE_READ | FILE_SHARE_WRITE | FILE_SHARE_DELETE, OPEN_EXISTING);
    return add([&](char* buffer, DWORD capacity) {
        DWORD count = 0;
        if (!ReadFile(source.get(), buffer, capacity, &count, nullptr))
            throw systemFailure(path, GetLastError());
        return count;
    });
}

ContentStore::Content ContentStore::addBytes(std::string_view bytes) const
{
    return add([&](char* buffer, DWORD capacity) {
        const std::size_t count = bytes.copy(buffer, capacity);
        bytes.remove_prefix(count);
        return static_cast<DWORD>(count);
    });
}

} // namespace service
