#include "base/LocalizedFormat.h"
#include "platform/linux/bundles/StringsTable.h"

#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <regex>
#include <set>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

namespace fs = std::filesystem;

using Keys = std::set<std::string>;

std::string textOf(const fs::path& file) {
    std::ifstream stream(file, std::ios::binary);
    return {std::istreambuf_iterator<char>(stream), {}};
}

/// The framework's tables by localization. Fails the test on a table that cannot be read.
std::map<std::string, StringsTable> readTables() {
    std::map<std::string, StringsTable> tables;
    for (const auto& entry : fs::directory_iterator(fs::path(KELVO_RESOURCES) / "KelvoKit.framework")) {
        if (entry.path().extension() != ".lproj") continue;
        auto table = StringsTable::parse(textOf(entry.path() / "Localizable.strings"));
        if (table) {
            tables.emplace(entry.path().stem().string(), std::move(*table));
        } else {
            ADD_FAILURE() << entry.path() << ": " << table.error().description();
        }
    }
    return tables;
}

Keys keysOf(const StringsTable& table) {
    Keys keys;
    for (const std::string_view key : table.keys())
        keys.emplace(key);
    return keys;
}

/// The message keys that stand in the program's sources.
Keys keysInSources() {
    static const std::regex kKey(
        R"re("((RECORDING|ACKNOWLEDGEMENT|BROADCAST[A-Z]*|SYSTEM_RECORDING|QUICK_PANEL)(_[A-Z0-9]+)+)")re");
    Keys keys;
    for (const auto& entry : fs::recursive_directory_iterator(KELVO_SOURCES)) {
        if (entry.path().extension() != ".cpp" && entry.path().extension() != ".h") continue;
        const std::string text = textOf(entry.path());
        for (std::sregex_iterator match(text.begin(), text.end(), kKey), end; match != end; ++match)
            keys.insert((*match)[1]);
    }
    return keys;
}

TEST(StringTablesTest, FrameworkSpeaksSevenLanguages) {
    Keys languages;
    for (const auto& [language, table] : readTables())
        languages.insert(language);
    EXPECT_EQ(languages, (Keys{"de", "en", "es", "fr", "ja", "pt", "zh-Hans"}));
}

TEST(StringTablesTest, EveryTableHasTheSameKeys) {
    const auto tables = readTables();
    const Keys expected = keysOf(tables.at("en"));
    EXPECT_FALSE(expected.empty());
    for (const auto& [language, table] : tables)
        EXPECT_EQ(keysOf(table), expected) << language;
}

TEST(StringTablesTest, EveryTextAsksForAsManyArgumentsInEachLanguage) {
    const auto tables = readTables();
    for (const std::string& key : keysOf(tables.at("en"))) {
        const std::size_t expected = placeholderCount(*tables.at("en").find(key));
        for (const auto& [language, table] : tables)
            EXPECT_EQ(placeholderCount(table.find(key).value_or("")), expected) << key << " in " << language;
    }
}

TEST(StringTablesTest, NoTextIsEmpty) {
    for (const auto& [language, table] : readTables()) {
        for (const std::string_view key : table.keys())
            EXPECT_FALSE(table.find(key)->empty()) << key << " in " << language;
    }
}

TEST(StringTablesTest, EveryKeyThatTheProgramLooksUpHasAText) {
    const Keys used = keysInSources();
    EXPECT_TRUE(used.contains("RECORDING_ERROR_UNKNOWN"));
    const Keys known = keysOf(readTables().at("en"));
    for (const std::string& key : used)
        EXPECT_TRUE(known.contains(key)) << key;
}

}  // namespace
}  // namespace kelvo
