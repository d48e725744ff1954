#include "platform/linux/library/LibraryIndex.h"

#include <algorithm>
#include <cerrno>
#include <sqlite3.h>

namespace kelvo {
namespace {

/// Tells the index apart from other SQLite files.
constexpr std::int64_t kApplicationIdentifier = 0x6b656c76;
constexpr std::int64_t kVersion = 1;

constexpr const char* kSchema =
    "BEGIN IMMEDIATE;"
    "CREATE TABLE movies (identifier TEXT PRIMARY KEY NOT NULL, fileName TEXT NOT NULL,"
    " creationDate INTEGER NOT NULL, state INTEGER NOT NULL) STRICT, WITHOUT ROWID;"
    "PRAGMA application_id = 1801809014;"  // kApplicationIdentifier
    "PRAGMA user_version = 1;"
    "COMMIT;";

std::string textOf(sqlite3_stmt* statement, int column) {
    const auto* text = reinterpret_cast<const char*>(sqlite3_column_text(statement, column));
    return text != nullptr
               ? std::string(text, static_cast<std::size_t>(sqlite3_column_bytes(statement, column)))
               : std::string();
}

/// The entry in a row; none when it leads out of the library's folder or is otherwise none of ours.
std::optional<LibraryEntry> entryOf(sqlite3_stmt* row) {
    LibraryEntry entry{textOf(row, 0), textOf(row, 1), {sqlite3_column_int64(row, 2)}, {}};
    const std::int64_t state = sqlite3_column_int64(row, 3);
    const bool isPlainName = !entry.fileName.empty() && entry.fileName.front() != '.' &&
                             entry.fileName.find_first_of(std::string_view("/\0", 2)) == std::string::npos;
    if (!isLibraryIdentifier(entry.identifier) || !isPlainName || state < 0 || state > 2) return std::nullopt;
    entry.state = static_cast<LibraryEntry::State>(state);
    return entry;
}

}  // namespace

KVError heldByAnother(const std::string& path) {
    return {std::string(kPOSIXErrorDomain),
            EBUSY,
            {{std::string(kLocalizedDescriptionKey),
              path + ": another program is using the library of recordings and does not let go of it"}}};
}

bool isLibraryIdentifier(std::string_view text) {
    constexpr std::size_t kLength = 36;
    return text.size() == kLength && text.find_first_not_of("0123456789ABCDEF-") == std::string_view::npos;
}

void LibraryIndex::Close::operator()(sqlite3* database) const {
    sqlite3_close_v2(database);
}

void LibraryIndex::Finalize::operator()(sqlite3_stmt* statement) const {
    sqlite3_finalize(statement);
}

LibraryIndex::~LibraryIndex() = default;

Result<LibraryIndex> LibraryIndex::open(const std::string& hostPath, std::chrono::milliseconds patience) {
    sqlite3* database = nullptr;
    constexpr int kFlags =
        SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE | SQLITE_OPEN_NOFOLLOW | SQLITE_OPEN_EXRESCODE;
    const int code = sqlite3_open_v2(hostPath.c_str(), &database, kFlags, nullptr);
    LibraryIndex index(database, hostPath);
    if (database == nullptr) return KVError::posix(ENOMEM, hostPath);
    if (code != SQLITE_OK) return index.failure();
    if (const OptionalError error = index.prepareFile(patience)) return *error;
    return index;
}

OptionalError LibraryIndex::prepareFile(std::chrono::milliseconds patience) {
    sqlite3_busy_timeout(database_.get(), static_cast<int>(patience.count()));
    // What a damaged or foreign file says is data, and never instructions.
    sqlite3_db_config(database_.get(), SQLITE_DBCONFIG_DEFENSIVE, 1, nullptr);
    sqlite3_db_config(database_.get(), SQLITE_DBCONFIG_TRUSTED_SCHEMA, 0, nullptr);
    if (OptionalError error = execute("PRAGMA synchronous = EXTRA")) return error;
    const auto application = number("PRAGMA application_id");
    if (!application) return application.error();
    const auto version = number("PRAGMA user_version");
    if (!version) return version.error();
    const auto tables = number("SELECT count(*) FROM sqlite_schema");
    if (!tables) return tables.error();
    if (*application == 0 && *version == 0 && *tables == 0) return execute(kSchema);
    if (*application != kApplicationIdentifier || *version != kVersion)
        return unusable(SQLITE_MISMATCH, "it is not the index of a movie library");
    // A file that was cut reads as if something had been removed, unless one looks closely.
    const auto isSound = number("SELECT quick_check = 'ok' FROM pragma_quick_check(1)");
    if (!isSound) return isSound.error();
    return *isSound == 1 ? OptionalError() : unusable(SQLITE_CORRUPT, "it is damaged");
}

OptionalError LibraryIndex::put(const LibraryEntry& entry) {
    return run(
        "INSERT OR REPLACE INTO movies (identifier, fileName, creationDate, state) VALUES (?, ?, ?, ?)",
        {entry.identifier, entry.fileName},
        {entry.creationDate.nanosecondsSince1970, static_cast<std::int64_t>(entry.state)});
}

OptionalError LibraryIndex::remove(std::string_view identifier) {
    return run("DELETE FROM movies WHERE identifier = ?", {identifier});
}

Result<std::vector<LibraryEntry>> LibraryIndex::entries() {
    sqlite3_stmt* raw = nullptr;
    sqlite3_prepare_v2(database_.get(),
                       "SELECT identifier, fileName, creationDate, state FROM movies"
                       " ORDER BY creationDate, identifier",
                       -1, &raw, nullptr);
    const Statement statement(raw);
    if (!statement) return failure();
    std::vector<LibraryEntry> entries;
    int code = SQLITE_ROW;
    while ((code = sqlite3_step(raw)) == SQLITE_ROW) {
        if (auto entry = entryOf(raw)) entries.push_back(std::move(*entry));
    }
    if (code != SQLITE_DONE) return failure();
    return entries;
}

Result<std::optional<LibraryEntry>> LibraryIndex::find(std::string_view identifier) {
    const auto all = entries();
    if (!all) return all.error();
    const auto found = std::ranges::find(*all, identifier, &LibraryEntry::identifier);
    return found != all->end() ? std::optional(*found) : std::nullopt;
}

Result<std::int64_t> LibraryIndex::number(const char* sql) {
    sqlite3_stmt* raw = nullptr;
    sqlite3_prepare_v2(database_.get(), sql, -1, &raw, nullptr);
    const Statement statement(raw);
    if (!statement || sqlite3_step(raw) != SQLITE_ROW) return failure();
    return std::int64_t{sqlite3_column_int64(raw, 0)};
}

OptionalError LibraryIndex::execute(const char* sql) {
    if (sqlite3_exec(database_.get(), sql, nullptr, nullptr, nullptr) == SQLITE_OK) return std::nullopt;
    const KVError error = failure();
    sqlite3_exec(database_.get(), "ROLLBACK", nullptr, nullptr, nullptr);  // of no effect outside of one
    return error;
}

OptionalError LibraryIndex::run(const char* sql, std::initializer_list<std::string_view> texts,
                                std::initializer_list<std::int64_t> numbers) {
    sqlite3_stmt* raw = nullptr;
    sqlite3_prepare_v2(database_.get(), sql, -1, &raw, nullptr);
    const Statement statement(raw);
    if (!statement) return failure();
    int position = 0;
    for (const std::string_view text : texts)
        sqlite3_bind_text(raw, ++position, text.data(), static_cast<int>(text.size()), SQLITE_TRANSIENT);
    for (const std::int64_t value : numbers)
        sqlite3_bind_int64(raw, ++position, value);
    return sqlite3_step(raw) == SQLITE_DONE ? OptionalError() : failure();
}

KVError LibraryIndex::failure() const {
    constexpr int kPrimaryCode = 0xff;
    const int code = sqlite3_errcode(database_.get()) & kPrimaryCode;
    const int systemCode = sqlite3_system_errno(database_.get());
    switch (code) {
        case SQLITE_FULL:
            return KVError::posix(ENOSPC, path_);
        case SQLITE_CANTOPEN:
        case SQLITE_IOERR:
            return KVError::posix(systemCode != 0 ? systemCode : EIO, path_);
        case SQLITE_READONLY:
        case SQLITE_PERM:
            return KVError::posix(EROFS, path_);
        case SQLITE_BUSY:
            return heldByAnother(path_);
        default:
            break;
    }
    return unusable(code, sqlite3_errmsg(database_.get()));
}

KVError LibraryIndex::unusable(int code, const std::string& reason) const {
    return {
        std::string(kLibraryIndexErrorDomain),
        code,
        {{std::string(kLocalizedDescriptionKey), "cannot use the library's index " + path_ + ": " + reason}}};
}

}  // namespace kelvo
