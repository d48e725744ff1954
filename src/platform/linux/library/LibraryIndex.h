#pragma once

#include "base/Date.h"
#include "base/Result.h"

#include <chrono>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

struct sqlite3;
struct sqlite3_stmt;

namespace kelvo {

/// Domain of errors about what the library's index says; the code is SQLite's.
inline constexpr std::string_view kLibraryIndexErrorDomain = "KVLibraryIndexErrorDomain";

/// What the index knows about one movie.
struct LibraryEntry {
    enum class State {
        staged = 0,    ///< the content is whole under its staging name and moves to `fileName`
        complete = 1,  ///< an item of the library
        removed = 2,   ///< the file goes, then the entry
    };

    std::string identifier;  ///< a UUID in upper case
    std::string fileName;    ///< in the library's folder
    Date creationDate;
    State state = State::staged;
};

/// The library's index, a SQLite file. Each change is on the disk, whole, when it returns, or was never made.
/// Open for as long as it lives; one thread at a time.
class LibraryIndex {
  public:
    /// Opens the index at a host path, making it if it is not there. Fails, leaving the file as it is, when
    /// it cannot be read or is not the index of a library. This and every operation fail with EBUSY when
    /// another program keeps the index locked for longer than `patience`.
    static Result<LibraryIndex> open(const std::string& hostPath, std::chrono::milliseconds patience);

    LibraryIndex(LibraryIndex&&) noexcept = default;
    ~LibraryIndex();

    /// Adds the entry or replaces the one of its identifier.
    OptionalError put(const LibraryEntry& entry);
    OptionalError remove(std::string_view identifier);

    /// By creation date. Entries that no library would have written are left out.
    Result<std::vector<LibraryEntry>> entries();
    Result<std::optional<LibraryEntry>> find(std::string_view identifier);

  private:
    struct Close {
        void operator()(sqlite3* database) const;
    };
    struct Finalize {
        void operator()(sqlite3_stmt* statement) const;
    };
    using Statement = std::unique_ptr<sqlite3_stmt, Finalize>;

    LibraryIndex(sqlite3* database, std::string path) : database_(database), path_(std::move(path)) {}
    OptionalError prepareFile(std::chrono::milliseconds patience);
    Result<std::int64_t> number(const char* sql);
    OptionalError execute(const char* sql);
    OptionalError run(const char* sql, std::initializer_list<std::string_view> texts,
                      std::initializer_list<std::int64_t> numbers = {});
    KVError failure() const;
    KVError unusable(int code, const std::string& reason) const;

    std::unique_ptr<sqlite3, Close> database_;
    std::string path_;
};

/// The error (EBUSY) of whoever waited in vain for another program that holds the file or folder at `path`.
KVError heldByAnother(const std::string& path);

/// Whether `text` is an identifier as the library makes them.
bool isLibraryIdentifier(std::string_view text);

}  // namespace kelvo
