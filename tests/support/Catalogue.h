#pragma once

#include <cstdint>
#include <map>
#include <string>

#include <wx/arrstr.h>
#include <wx/translation.h>

#include "core/Text.h"

namespace tavi::test {

// A message catalogue in force for as long as it lives: the given texts, each translated as shown.
class Catalogue {
  public:
    using Texts = std::map<wxString, wxString>;
    explicit Catalogue(const Texts& texts)
    {
        auto* const translations = new wxTranslations;
        translations->SetLoader(new Loader(texts));
        translations->SetLanguage("de");
        wxTranslations::Set(translations);
        translations->AddCatalog("tavi", wxLANGUAGE_ENGLISH);
    }
    Catalogue(const Catalogue&) = delete;
    Catalogue& operator=(const Catalogue&) = delete;
    ~Catalogue()
    {
        wxTranslations::Set(nullptr);
    }

  private:
    class Loader : public wxTranslationsLoader {
      public:
        explicit Loader(Texts texts)
        {
            // The file form of gettext: a header, two tables of (length, offset) in the order of the originals, the
            // texts.
            texts[""] = "Content-Type: text/plain; charset=UTF-8\n";
            const auto count = static_cast<std::uint32_t>(texts.size());
            const std::uint32_t header[] = {0x950412de, 0, count, 28, 28 + 8 * count, 0, 0};
            std::string tables[2], data;
            for (const auto& entry : texts) {
                for (int table = 0; table < 2; ++table) {
                    const std::string text = toUtf8(view(table == 0 ? entry.first : entry.second));
                    const std::uint32_t place[] = {static_cast<std::uint32_t>(text.size()),
                                                   static_cast<std::uint32_t>(28 + 16 * count + data.size())};
                    tables[table].append(reinterpret_cast<const char*>(place), sizeof(place));
                    data.append(text.c_str(), text.size() + 1);
                }
            }
            file_ = std::string(reinterpret_cast<const char*>(header), sizeof(header)) + tables[0] + tables[1] + data;
        }
        wxMsgCatalog* LoadCatalog(const wxString& domain, const wxString&) override
        {
            return wxMsgCatalog::CreateFromData(wxScopedCharBuffer::CreateNonOwned(file_.data(), file_.size()), domain);
        }
        wxArrayString GetAvailableTranslations(const wxString&) const override
        {
            return wxArrayString(1, &kLanguage);
        }

      private:
        const wxString kLanguage = "de";
        std::string file_;
    };
};

} // namespace tavi::test
