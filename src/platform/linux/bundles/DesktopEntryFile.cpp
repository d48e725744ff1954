#include "platform/linux/bundles/DesktopEntryFile.h"

#include "base/UTF8.h"
#include "platform/linux/bundles/LocaleLanguages.h"
#include "platform/linux/bundles/MalformedFile.h"

#include <algorithm>
#include <optional>

namespace kelvo {
namespace {

constexpr std::size_t kLongestText = 4096;
constexpr std::size_t kMostNames = 1024;
constexpr std::string_view kGroup = "[Desktop Entry]";
constexpr std::string_view kSpaces = " \t\r";

std::string_view trimmed(std::string_view text) {
    const std::size_t first = std::min(text.find_first_not_of(kSpaces), text.size());
    text.remove_prefix(first);
    return text.substr(0, text.find_last_not_of(kSpaces) + 1);
}

/// A text with its escapes undone.
std::string unescaped(std::string_view text) {
    std::string result;
    for (std::size_t i = 0; i < text.size(); ++i) {
        if (text[i] != '\\' || i + 1 == text.size()) {
            result += text[i];
            continue;
        }
        switch (text[++i]) {
            case 's':
                result += ' ';
                break;
            case 'n':
                result += '\n';
                break;
            case 't':
                result += '\t';
                break;
            case 'r':
                result += '\r';
                break;
            case '\\':
                result += '\\';
                break;
            default:
                result.append({'\\', text[i]});  // a command's own escapes
        }
    }
    return result;
}

/// A place where the desktop puts files, the icon and the like.
bool isPlace(const std::string& argument) {
    return argument.size() == 2 && argument[0] == '%' && argument[1] != '%';
}

/// Takes an argument from the front of `rest`; none when its quotes do not end.
std::optional<std::string> takeArgument(std::string_view& rest) {
    std::string argument;
    bool isQuoted = false;
    std::size_t i = 0;
    for (; i < rest.size() && (isQuoted || rest[i] != ' '); ++i) {
        if (rest[i] == '"') {
            isQuoted = !isQuoted;
        } else {
            if (rest[i] == '\\' && isQuoted && i + 1 < rest.size()) ++i;
            argument += rest[i];
        }
    }
    rest.remove_prefix(i);
    return isQuoted ? std::nullopt : std::optional(argument);
}

class EntryReader {
  public:
    DesktopEntryFile entry;

    /// What is wrong with the line; empty when nothing is.
    std::string take(std::string_view key, std::string_view value) {
        if (value.size() > kLongestText) return "the text is too long";
        if (key == "Type") entry.isApplication = value == "Application";
        if (key == "Hidden") entry.isHidden = value == "true";
        if (key == "Terminal") entry.isForTerminal = value == "true";
        if (key == "Name") entry.name = unescaped(value);
        if (key == "Icon") entry.icon = unescaped(value);
        if (key.starts_with("Name[") && key.ends_with(']')) return takeName(key, value);
        return key == "Exec" ? takeCommand(unescaped(value)) : std::string();
    }

  private:
    std::string takeName(std::string_view key, std::string_view value) {
        const std::string_view locale = key.substr(5, key.size() - 6);
        const std::string tag = languageTag(locale);
        // Another way of writing the language is not what its speakers ask for.
        if (tag.empty() || locale.find('@') != std::string_view::npos) return {};
        if (entry.localizedNames.size() >= kMostNames) return "too many names";
        entry.localizedNames.set(tag, unescaped(value));
        return {};
    }

    std::string takeCommand(std::string_view rest) {
        entry.command.clear();
        for (rest = trimmed(rest); !rest.empty(); rest = trimmed(rest)) {
            auto argument = takeArgument(rest);
            if (!argument) return "the quotes of the command do not end";
            if (!isPlace(*argument)) entry.command.push_back(std::move(*argument));
        }
        return {};
    }
};

}  // namespace

Result<DesktopEntryFile> DesktopEntryFile::parse(std::string_view text) {
    if (text.size() > kMostBytes) return malformedFile(0, "the file is too large");
    if (!isUTF8(text)) return malformedFile(0, "not UTF-8");
    EntryReader reader;
    bool isBegun = false;
    for (std::size_t line = 1; !text.empty(); ++line) {
        const std::size_t end = std::min(text.find('\n'), text.size());
        const std::string_view content = trimmed(text.substr(0, end));
        text.remove_prefix(std::min(end + 1, text.size()));
        if (content.empty() || content.front() == '#') continue;
        if (isBegun && content.front() == '[') break;
        if (!isBegun && content != kGroup) return malformedFile(line, "not a desktop entry");
        const bool isKey = std::exchange(isBegun, true);
        const std::size_t equals = content.find('=');
        if (!isKey) continue;
        if (equals == std::string_view::npos) return malformedFile(line, "no key");
        const std::string problem =
            reader.take(trimmed(content.substr(0, equals)), trimmed(content.substr(equals + 1)));
        if (!problem.empty()) return malformedFile(line, problem);
    }
    if (!isBegun) return malformedFile(0, "not a desktop entry");
    DesktopEntryFile& entry = reader.entry;
    if (!entry.localizedNames.contains("en")) entry.localizedNames.set("en", entry.name);
    return std::move(entry);
}

bool DesktopEntryFile::speaksForItsProgram() const {
    return !command.empty() && std::all_of(command.begin() + 1, command.end(),
                                           [](const auto& argument) { return argument.starts_with('-'); });
}

}  // namespace kelvo
