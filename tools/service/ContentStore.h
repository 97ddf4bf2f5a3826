#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace service {

// The form of a path that is not bound to 260 characters.
std::wstring longPath(const std::wstring& path);

std::wstring hashOf(std::string_view bytes);

// The bytes of every version, each kept once in a file that is named by their SHA-1.
class ContentStore {
  public:
    explicit ContentStore(std::wstring folder);

    struct Content {
        std::wstring hash;
        std::int64_t size = 0;
    };
    // Throws when the file cannot be read.
    Content addFile(const std::wstring& path) const;
    Content addBytes(std::string_view bytes) const;
    std::wstring pathOf(const std::wstring& hash) const;

  private:
    template <class Read>
    Content add(Read read) const;

    std::wstring folder_;
};

} // namespace service
