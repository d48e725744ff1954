#include "platform/linux/bundles/BundleInfo.h"

#include "platform/linux/bundles/MalformedFile.h"

#include <array>

#include <nlohmann/json.hpp>

namespace kelvo {
namespace {

constexpr std::size_t kDeepestNesting = 32;
constexpr std::size_t kLongestToken = 4096;
constexpr std::size_t kRootDepth = 1;
constexpr std::size_t kSectionDepth = 2;

using Json = nlohmann::json;

/// The parser keeps the text or number that it reads, so an endless one is refused before it starts.
bool hasEndlessToken(std::string_view json) {
    bool isInside = false;
    std::size_t length = 0;
    for (std::size_t i = 0; i < json.size(); ++i) {
        const bool isQuote = json[i] == '"';
        if (isQuote) isInside = !isInside;
        if (isQuote ||
            (!isInside && std::string_view(",:[]{} \t\r\n").find(json[i]) != std::string_view::npos)) {
            length = 0;
        } else if (++length > kLongestToken) {
            return true;
        } else if (isInside && json[i] == '\\') {
            ++i;
        }
    }
    return false;
}

/// Receives the file's pieces as they are read and keeps the known ones, so that nothing else is ever held.
class InfoReader : public nlohmann::json_sax<Json> {
  public:
    BundleInfo info;
    std::string problem;

    bool null() override { return take(Value()); }
    bool boolean(bool value) override { return take(value); }
    bool number_integer(number_integer_t value) override { return take(std::int64_t{value}); }
    bool number_unsigned(number_unsigned_t value) override { return take(std::uint64_t{value}); }
    bool number_float(number_float_t value, const string_t&) override { return take(value); }
    bool string(string_t& value) override { return take(value); }
    bool binary(binary_t&) override { return fail("binary data"); }

    bool start_object(std::size_t) override {
        if (depth_ == 0) return enter();
        if (depth_ == kRootDepth && knowsScalar()) return fail(key_ + " is not a text");
        section_ = depth_ == kRootDepth ? sectionNamed(key_) : section_;
        return enter();
    }
    bool end_object() override {
        --depth_;
        if (depth_ == kRootDepth) section_ = nullptr;
        return true;
    }
    bool key(string_t& name) override {
        if (depth_ == kRootDepth) key_ = name;
        if (depth_ == kSectionDepth) sectionKey_ = name;
        return true;
    }
    bool start_array(std::size_t) override {
        if (depth_ == 0) return fail("not an object");
        if (depth_ == kRootDepth && knowsKey()) return fail(key_ + " is an array");
        if (isInSection()) array_.emplace();
        return enter();
    }
    bool end_array() override {
        --depth_;
        if (!array_ || !isInSection()) return true;
        const Value array = std::move(*array_);
        array_.reset();
        section_->set(sectionKey_, array);
        return true;
    }
    bool parse_error(std::size_t position, const std::string&, const Json::exception&) override {
        return fail("not JSON at byte " + std::to_string(position));
    }

  private:
    bool fail(std::string reason) {
        if (problem.empty()) problem = std::move(reason);
        return false;
    }

    bool enter() { return ++depth_ <= kDeepestNesting || fail("nested too deeply"); }

    bool isInSection() const { return section_ != nullptr && depth_ == kSectionDepth; }

    bool take(Value value) {
        if (depth_ == 0) return fail("not an object");
        if (depth_ == kRootDepth) return takeAtRoot(value);
        if (section_ == nullptr || depth_ > kSectionDepth + (array_ ? 1 : 0)) return true;
        if (++entryCount_ > BundleInfo::kMostEntries) return fail("too many entries");
        if (array_) {
            array_->push_back(std::move(value));
        } else {
            section_->set(sectionKey_, std::move(value));
        }
        return true;
    }

    bool takeAtRoot(const Value& value) {
        if (sectionNamed(key_) != nullptr) return fail(key_ + " is not an object");
        if (!knowsScalar()) return true;
        const std::string* text = value.asString();
        if (text == nullptr) return fail(key_ + " is not a text");
        if (key_ == "identifier") info.identifier = *text;
        if (key_ == "name") info.name = *text;
        if (key_ == "displayName") info.displayName = *text;
        if (key_ == "executable") info.executable = *text;
        if (key_ == "icon") info.icon = *text;
        if (key_ == "developmentLanguage") info.developmentLanguage = *text;
        return true;
    }

    bool knowsScalar() const {
        constexpr std::array<std::string_view, 6> kKeys{"identifier", "name", "displayName",
                                                        "executable", "icon", "developmentLanguage"};
        return std::find(kKeys.begin(), kKeys.end(), key_) != kKeys.end();
    }
    bool knowsKey() { return knowsScalar() || sectionNamed(key_) != nullptr; }

    Dictionary* sectionNamed(std::string_view key) {
        if (key == "localizedNames") return &info.localizedNames;
        if (key == "entitlements") return &info.entitlements;
        if (key == "extension") return &info.extension;
        return nullptr;
    }

    std::size_t depth_ = 0;
    std::size_t entryCount_ = 0;
    std::string key_;
    std::string sectionKey_;
    Dictionary* section_ = nullptr;  // the section being read
    std::optional<Array> array_;     // the array being read inside it
};

}  // namespace

Result<BundleInfo> BundleInfo::parse(std::string_view json) {
    if (json.size() > kMostBytes) return malformedFile(0, "the file is too large");
    if (hasEndlessToken(json)) return malformedFile(0, "a text or a number is too long");
    InfoReader reader;
    if (Json::sax_parse(json.begin(), json.end(), &reader)) return std::move(reader.info);
    return malformedFile(0, reader.problem);
}

}  // namespace kelvo
