#include "platform/linux/analytics/AnalyticsLine.h"

#include <cmath>

#include <nlohmann/json.hpp>

namespace kelvo {
namespace {

using Json = nlohmann::ordered_json;

constexpr int kDeepestNesting = 8;

Json jsonOf(const Value& value, int depth);

Json jsonOf(const Dictionary& dictionary, int depth) {
    Json json = Json::object();
    for (const auto& [key, value] : dictionary)
        json[key] = jsonOf(value, depth);
    return json;
}

Json jsonOf(const Value& value, int depth) {
    if (value.isNothing() || depth == 0) return nullptr;
    if (const auto* boolean = value.as<bool>()) return *boolean;
    if (const auto* number = value.as<std::int64_t>()) return *number;
    if (const auto* number = value.as<std::uint64_t>()) return *number;
    if (const auto* number = value.as<double>()) return *number;  // infinities read as null
    if (const auto* text = value.asString()) return *text;
    if (const auto* date = value.as<Date>()) return date->secondsSince1970();
    if (const auto* dictionary = value.asDictionary()) return jsonOf(*dictionary, depth - 1);
    if (const auto* array = value.asArray()) {
        Json json = Json::array();
        for (const Value& item : *array)
            json.push_back(jsonOf(item, depth - 1));
        return json;
    }
    return value.description();
}

}  // namespace

std::string analyticsLine(const AnalyticsMessage& message, Date time) {
    const Json json{{"time", std::floor(time.secondsSince1970() * 1000) / 1000},
                    {"clientName", message.clientName},
                    {"serviceName", message.serviceName},
                    {"clientType", message.clientType},
                    {"clientVersion", message.clientVersion},
                    {"sessionIdentifier", message.sessionIdentifier},
                    {"batchEvent", message.isBatchEvent},
                    {"userInfoRequired", message.isUserInfoRequired},
                    {"category", message.category},
                    {"type", message.type},
                    {"payload", jsonOf(message.payload, kDeepestNesting)}};
    return json.dump(-1, ' ', false, Json::error_handler_t::replace);
}

}  // namespace kelvo
