#pragma once

#include "base/Date.h"
#include "base/URL.h"

#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <variant>
#include <vector>

namespace kelvo {

class KVError;
class Value;

/// An object that a value carries by handle, never by its bytes: a surface, an endpoint.
class ObjectHandle {
  public:
    virtual ~ObjectHandle() = default;

  protected:
    ObjectHandle() = default;
    ObjectHandle(const ObjectHandle&) = default;
    ObjectHandle& operator=(const ObjectHandle&) = default;
};

using Bytes = std::vector<std::byte>;
using Array = std::vector<Value>;

/// A dictionary with string keys that keeps the order in which keys were first set. Look-ups walk the
/// entries; the dictionaries of this system hold tens of them. Not thread-safe.
class Dictionary {
  public:
    using Entry = std::pair<std::string, Value>;

    Dictionary();
    Dictionary(std::initializer_list<Entry> entries);
    Dictionary(const Dictionary&);
    Dictionary(Dictionary&&) noexcept;
    Dictionary& operator=(const Dictionary&);
    Dictionary& operator=(Dictionary&&) noexcept;
    ~Dictionary();

    /// The value under `key`, or none.
    const Value* find(std::string_view key) const;
    bool contains(std::string_view key) const { return find(key) != nullptr; }

    /// Sets `key`; a key that exists keeps its place.
    void set(std::string_view key, Value value);

    /// Removes `key` and says whether it was there.
    bool remove(std::string_view key);

    /// Sets every entry of `other` here; its values win.
    void merge(const Dictionary& other);

    std::size_t size() const;
    bool empty() const { return size() == 0; }
    std::vector<Entry>::const_iterator begin() const;
    std::vector<Entry>::const_iterator end() const;

    /// Equal entries in the same order.
    friend bool operator==(const Dictionary& left, const Dictionary& right);

  private:
    std::vector<Entry> entries_;
};

/// The one dynamic type: what preferences hold, what crosses process boundaries and what user information is
/// made of. Value semantics; not thread-safe.
class Value {
  public:
    Value() = default;
    Value(bool boolean) : content_(boolean) {}
    Value(int number) : content_(std::int64_t{number}) {}
    Value(std::int64_t number) : content_(number) {}
    Value(std::uint32_t number) : content_(std::int64_t{number}) {}
    Value(std::uint64_t number) : content_(number) {}
    Value(double number) : content_(number) {}
    Value(const char* text) : content_(std::string(text)) {}
    Value(std::string_view text) : content_(std::string(text)) {}
    Value(std::string text) : content_(std::move(text)) {}
    Value(Bytes bytes) : content_(std::move(bytes)) {}
    Value(Date date) : content_(date) {}
    Value(URL url) : content_(std::move(url)) {}
    Value(const KVError& error);
    Value(Array array) : content_(std::move(array)) {}
    Value(Dictionary dictionary) : content_(std::move(dictionary)) {}
    Value(std::shared_ptr<ObjectHandle> handle) : content_(std::move(handle)) {}
    template <typename Pointee>
    Value(Pointee*) = delete;  // a stray pointer must not become a boolean

    bool isNothing() const { return std::holds_alternative<std::monostate>(content_); }

    /// The content when it is of exactly that type, else none.
    template <typename Type>
    const Type* as() const {
        return std::get_if<Type>(&content_);
    }
    const std::string* asString() const { return as<std::string>(); }
    const Array* asArray() const { return as<Array>(); }
    const Dictionary* asDictionary() const { return as<Dictionary>(); }
    const KVError* asError() const;

    /// Booleans and numbers read as each other: a boolean is 0 or 1, a double is cut towards zero. None for
    /// any other type, and for a number that does not fit.
    std::optional<std::int64_t> asInteger() const;
    std::optional<double> asDouble() const;
    std::optional<bool> asBool() const;

    /// What a person reads in a log: `{"key" = 1; "other" = "text"}`. Nesting beyond 8 levels reads as "…".
    std::string description() const;

    /// Same type and same content; errors by content, handles by identity.
    friend bool operator==(const Value& left, const Value& right);

  private:
    using ErrorPointer = std::shared_ptr<const KVError>;
    using Content =
        std::variant<std::monostate, bool, std::int64_t, std::uint64_t, double, std::string, Bytes, Date, URL,
                     ErrorPointer, Array, Dictionary, std::shared_ptr<ObjectHandle>>;
    Content content_;
};

}  // namespace kelvo
