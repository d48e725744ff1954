#include "platform/linux/ipc/DBusTypes.h"

#include "base/KVError.h"

namespace kelvo::dbus {

std::size_t alignmentOf(char type) {
    switch (type) {
        case 'y':
        case 'g':
        case 'v':
            return 1;
        case 'n':
        case 'q':
            return 2;
        case 'x':
        case 't':
        case 'd':
        case '(':
        case '{':
            return 8;
        default:
            return 4;
    }
}

std::string_view variantSignature(const Value& value) {
    if (value.isNothing()) return kNothingSignature;
    if (value.as<bool>() != nullptr) return "b";
    if (value.as<std::int64_t>() != nullptr) return "x";
    if (value.as<std::uint64_t>() != nullptr) return "t";
    if (value.as<double>() != nullptr) return "d";
    if (value.asString() != nullptr) return "s";
    if (value.as<Bytes>() != nullptr) return "ay";
    if (value.as<Date>() != nullptr) return kDateSignature;
    if (value.as<URL>() != nullptr) return kURLSignature;
    if (value.asError() != nullptr) return kErrorSignature;
    if (value.asArray() != nullptr) return "av";
    if (value.asDictionary() != nullptr) return "a{sv}";
    return {};
}

Value asStructure(const Value& value) {
    if (value.isNothing()) return 0;
    if (const auto* date = value.as<Date>()) return Array{date->nanosecondsSince1970};
    if (const auto* url = value.as<URL>()) return Array{url->absoluteString()};
    if (const KVError* error = value.asError())
        return Array{error->domain(), error->code(), error->userInfo()};
    return value;
}

Value fromStructure(std::string_view signature, Value value) {
    if (signature == kNothingSignature) return {};
    const Array* fields = value.asArray();
    if (fields == nullptr) return value;
    if (signature == kDateSignature) return Date{*fields->front().as<std::int64_t>()};
    if (signature == kURLSignature) return URL(*fields->front().asString());
    if (signature == kErrorSignature) {
        return KVError(*(*fields)[0].asString(), *(*fields)[1].as<std::int64_t>(),
                       *(*fields)[2].asDictionary());
    }
    return value;
}

}  // namespace kelvo::dbus
