#include "base/Value.h"

#include "base/KVError.h"

#include <cmath>

namespace kelvo {

Value::Value(const KVError& error) : content_(std::make_shared<const KVError>(error)) {}

const KVError* Value::asError() const {
    const auto* pointer = as<ErrorPointer>();
    return pointer != nullptr ? pointer->get() : nullptr;
}

std::optional<std::int64_t> Value::asInteger() const {
    if (const auto* boolean = as<bool>()) return *boolean ? 1 : 0;
    if (const auto* number = as<std::int64_t>()) return *number;
    if (const auto* number = as<std::uint64_t>(); number != nullptr && *number <= INT64_MAX) {
        return static_cast<std::int64_t>(*number);
    }
    constexpr double kTwoTo63 = 9223372036854775808.0;
    if (const auto* number = as<double>(); number != nullptr && *number >= -kTwoTo63 && *number < kTwoTo63) {
        return static_cast<std::int64_t>(*number);
    }
    return std::nullopt;
}

std::optional<double> Value::asDouble() const {
    if (const auto* number = as<double>()) return *number;
    if (const auto* number = as<std::uint64_t>()) return static_cast<double>(*number);
    if (const auto integer = asInteger()) return static_cast<double>(*integer);
    return std::nullopt;
}

std::optional<bool> Value::asBool() const {
    if (const auto number = asDouble()) return *number != 0;
    return std::nullopt;
}

bool operator==(const Value& left, const Value& right) {
    const KVError* leftError = left.asError();
    const KVError* rightError = right.asError();
    if (leftError != nullptr && rightError != nullptr) return *leftError == *rightError;
    return left.content_ == right.content_;
}

namespace {

constexpr int kDeepestDescription = 8;

/// Writes one value for a person to read.
class Describer {
  public:
    static std::string describe(const Value& value, int depth) {
        if (depth > kDeepestDescription) return "…";
        if (const auto* dictionary = value.asDictionary()) return describeEntries(*dictionary, depth);
        if (const auto* array = value.asArray()) return describeItems(*array, depth);
        return describeScalar(value);
    }

  private:
    static std::string describeScalar(const Value& value) {
        if (value.isNothing()) return "(none)";
        if (const auto* text = value.asString()) return '"' + *text + '"';
        if (const auto* error = value.asError()) return error->description();
        if (const auto* url = value.as<URL>()) return url->absoluteString();
        if (const auto* bytes = value.as<Bytes>()) return "<" + std::to_string(bytes->size()) + " bytes>";
        if (const auto* date = value.as<Date>()) return localTimeText(*date, "%Y-%m-%d %H:%M:%S");
        if (const auto* number = value.as<double>()) return std::to_string(*number);
        if (const auto* number = value.as<std::uint64_t>()) return std::to_string(*number);
        if (const auto integer = value.asInteger()) return std::to_string(*integer);
        return "<object>";
    }

    static std::string describeItems(const Array& array, int depth) {
        std::string text = "(";
        for (const Value& item : array) {
            if (text.size() > 1) text += ", ";
            text += describe(item, depth + 1);
        }
        return text + ")";
    }

    static std::string describeEntries(const Dictionary& dictionary, int depth) {
        std::string text = "{";
        for (const auto& [key, value] : dictionary) {
            if (text.size() > 1) text += "; ";
            text += '"' + key + "\" = " + describe(value, depth + 1);
        }
        return text + "}";
    }
};

}  // namespace

std::string Value::description() const {
    return Describer::describe(*this, 0);
}

}  // namespace kelvo
