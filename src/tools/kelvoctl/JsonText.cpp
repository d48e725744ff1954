#include "tools/kelvoctl/JsonText.h"

#include "base/KVError.h"

#include <nlohmann/json.hpp>

namespace kelvo::ctl {
namespace {

using Json = nlohmann::ordered_json;

std::string base64(const Bytes& bytes) {
    constexpr std::string_view alphabet = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
    std::string text;
    for (std::size_t i = 0; i < bytes.size(); i += 3) {
        std::uint32_t group = 0;
        for (std::size_t k = 0; k < 3; ++k)
            group = group << 8 | (i + k < bytes.size() ? std::to_integer<std::uint32_t>(bytes[i + k]) : 0);
        for (std::size_t k = 0; k < 4; ++k)
            text += i + k > bytes.size() ? '=' : alphabet[group >> (18 - 6 * k) & 63];
    }
    return text;
}

Json jsonOf(const Value& value) {
    if (const KVError* error = value.asError()) {
        return {{"domain", error->domain()},
                {"code", error->code()},
                {"description", error->localizedDescription()}};
    }
    if (const auto* text = value.asString()) return *text;
    if (const auto* url = value.as<URL>()) return url->absoluteString();
    if (const auto* flag = value.as<bool>()) return *flag;
    if (const auto* number = value.as<std::int64_t>()) return *number;
    if (const auto* number = value.as<std::uint64_t>()) return *number;
    if (const auto* number = value.as<double>()) return *number;
    if (const auto* date = value.as<Date>()) return date->secondsSince1970();
    if (const auto* bytes = value.as<Bytes>()) return base64(*bytes);
    if (const Array* array = value.asArray()) {
        Json list = Json::array();
        for (const Value& each : *array)
            list.push_back(jsonOf(each));
        return list;
    }
    if (const Dictionary* dictionary = value.asDictionary()) {
        Json object = Json::object();
        for (const auto& [key, each] : *dictionary)
            object[key] = jsonOf(each);
        return object;
    }
    return nullptr;
}

}  // namespace

std::string jsonText(const Value& value) {
    return jsonOf(value).dump(-1, ' ', false, Json::error_handler_t::replace);
}

}  // namespace kelvo::ctl
