#pragma once

#include "platform/Bundles.h"

namespace kelvo {

/// The languages of the process's locale: LANGUAGE (a list), else the first of LC_ALL, LC_MESSAGES and LANG
/// that is set; English when none of them names a language. Immutable; thread-safe.
class LocaleLanguages : public Languages {
  public:
    /// Reads the environment, before other threads can change it.
    LocaleLanguages();

    /// From given texts, as the variables hold them; `locale` is the one that decides when `languageList` is
    /// empty.
    LocaleLanguages(std::string_view languageList, std::string_view locale);

    std::vector<std::string> preferredLanguages() override { return languages_; }

  private:
    std::vector<std::string> languages_;
};

/// The language tag of a locale's name: "pt_BR.UTF-8" is "pt-BR", and Chinese locales name their script
/// ("zh_CN" is "zh-Hans-CN"). Empty for "C", "POSIX" and what is no locale's name.
std::string languageTag(std::string_view localeName);

/// The one of `names`, by language tag, that serves a user of `languages` best; none when there is none.
std::optional<std::string> nameForUser(const Dictionary& names, Languages& languages);

}  // namespace kelvo
