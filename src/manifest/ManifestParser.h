#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "manifest/ManifestBuilder.h"

namespace tavi {

// The line machine of the manifest text, fed as the bytes arrive. The text is well-formed UTF-8, in which surrogates
// may stand in their three-byte form; slices may end anywhere. One thread.
class ManifestParser {
  public:
    ManifestParser();

    // A zero byte must stand behind the bytes.
    void feed(const char* bytes, std::size_t length);
    // Whether a line was invalid; it has been logged, and what is fed after it counts for nothing.
    bool failed() const noexcept
    {
        return !builder_;
    }
    // The text is complete and has this many UTF-16 units. Returns null if a line was invalid.
    ManifestRef finish(std::uint32_t units);

  private:
    enum class Section { kHeader, kUser, kFiles, kSkipped };

    const char* feedVersions(const char* at, const char* end);
    void keepForLater(std::string_view part);
    void endLine(std::string_view line);
    void endSection();
    void endUserSection();
    void fileLine(std::string_view line, bool last);
    void patchLine(std::string_view line);
    bool addPatch(std::string_view line);
    void flushFile();

    std::optional<ManifestBuilder> builder_;
    Section section_ = Section::kHeader;
    // Newlines that stand directly before this point of the section.
    unsigned newlines_ = 0;
    // The part of the current line that earlier slices brought.
    std::string carry_;
    std::string userText_;
    std::string path_;
    bool hasPath_ = false;
    std::uint32_t firstVersion_ = 0;
};

} // namespace tavi
