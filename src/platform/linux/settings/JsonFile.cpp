#include "platform/linux/settings/JsonFile.h"

#include "platform/linux/files/ReadFile.h"

#include <cerrno>

#include <nlohmann/json.hpp>

namespace kelvo {
namespace {

using Json = nlohmann::ordered_json;

constexpr std::size_t kMostBytes = 64U << 10;
constexpr int kDeepestNesting = 16;

Value valueFrom(const Json& json, int depth);

Value arrayFrom(const Json& json, int depth) {
    Array array;
    for (const Json& item : json)
        array.push_back(valueFrom(item, depth));
    return array;
}

Dictionary dictionaryFrom(const Json& json, int depth) {
    Dictionary dictionary;
    for (const auto& [key, item] : json.items())
        dictionary.set(key, valueFrom(item, depth));
    return dictionary;
}

Value valueFrom(const Json& json, int depth) {
    if (depth == 0) return {};
    switch (json.type()) {
        case Json::value_t::boolean:
            return json.get<bool>();
        case Json::value_t::number_integer:
            return json.get<std::int64_t>();
        case Json::value_t::number_unsigned:
            return json.get<std::uint64_t>() <= INT64_MAX ? Value(json.get<std::int64_t>())
                                                          : Value(json.get<std::uint64_t>());
        case Json::value_t::number_float:
            return json.get<double>();
        case Json::value_t::string:
            return json.get<std::string>();
        case Json::value_t::array:
            return arrayFrom(json, depth - 1);
        case Json::value_t::object:
            return dictionaryFrom(json, depth - 1);
        default:
            return {};
    }
}

}  // namespace

Result<Dictionary> readJsonFile(const std::string& hostPath) {
    const Result<std::string> content = readFile(hostPath, kMostBytes);
    if (!content && content.error().code() == ENOENT) return Dictionary();
    if (!content) return content.error();
    const Json json = Json::parse(*content, nullptr, false);
    if (!json.is_object()) return KVError::posix(EINVAL, hostPath + " is not a JSON object");
    return dictionaryFrom(json, kDeepestNesting);
}

}  // namespace kelvo
