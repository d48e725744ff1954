#include "platform/linux/bundles/DesktopEntries.h"

#include "base/KVLog.h"
#include "platform/linux/files/ReadFile.h"

#include <algorithm>
#include <chrono>

namespace kelvo {
namespace {

namespace fs = std::filesystem;

constexpr std::size_t kMostFiles = 4096;
constexpr int kDeepest = 4;
/// Volumes tell times in steps of this at most, but for old ones.
constexpr std::chrono::milliseconds kFinestTime{100};
constexpr std::string_view kSuffix = ".desktop";
constexpr std::string_view kSystemPrefix = "com.quillon.";

fs::file_time_type changeOf(const std::string& folder) {
    std::error_code code;
    const auto time = fs::last_write_time(folder, code);
    return code ? fs::file_time_type::min() : time;
}

/// The file that a path leads to; empty when there is none.
std::string resolved(const std::string& path) {
    std::error_code code;
    std::string file = fs::canonical(path, code).string();
    return code ? std::string() : file;
}

}  // namespace

/// One walk through all folders.
class DesktopEntries::Scan {
  public:
    explicit Scan(DesktopEntries& entries) : entries_(entries) {}

    std::shared_ptr<const Index> run() {
        index_->begun = fs::file_time_type::clock::now();
        for (const std::string& folder : entries_.folders_.data)
            walk(folder + "/applications", "", 0);
        for (const bool isPlain : {true, false}) {
            for (const auto& entry : found_) {
                const bool isOfTurn = entry->file.isPlain() == isPlain && entry->file.speaksForItsProgram();
                const std::string program =
                    isOfTurn ? entries_.programFile(entry->file.command.front()) : std::string();
                if (!program.empty()) index_->byProgram.try_emplace(program, entry);
            }
        }
        return index_;
    }

  private:
    void walk(const std::string& folder, const std::string& prefix, int depth) {
        index_->folders[folder] = changeOf(folder);
        std::vector<fs::directory_entry> items;
        std::error_code code;
        for (fs::directory_iterator item(folder, code), end; !code && item != end; item.increment(code)) {
            if (++count_ > kMostFiles) break;
            items.push_back(*item);
        }
        std::sort(items.begin(), items.end());
        for (const fs::directory_entry& item : items) {
            const std::string name = item.path().filename().string();
            std::error_code ignored;
            if (item.is_directory(ignored) && depth + 1 < kDeepest)
                walk(item.path().string(), prefix + name + "-", depth + 1);
            if (name.ends_with(kSuffix))
                take(item.path().string(), prefix + name.substr(0, name.size() - kSuffix.size()));
        }
    }

    void take(const std::string& hostFile, const std::string& identifier) {
        if (identifier.empty() || identifier.starts_with(kSystemPrefix)) return;
        if (!identifiers_.insert(identifier).second) return;
        const auto text = readFile(hostFile, DesktopEntryFile::kMostBytes);
        auto file = text ? DesktopEntryFile::parse(*text) : Result<DesktopEntryFile>(text.error());
        if (!file) {
            if (entries_.malformed_.with([&](auto& known) { return known.insert(hostFile).second; }))
                KVLogError("cannot read %s: %s", hostFile.c_str(),
                           file.error().localizedDescription().c_str());
            return;
        }
        const bool isNamed = !file->name.empty() && !file->command.empty();
        if (!isNamed || !file->isApplication || file->isHidden || file->isForTerminal) return;
        found_.push_back(std::make_shared<const DesktopApplicationEntry>(
            DesktopApplicationEntry{identifier, hostFile, std::move(*file)}));
        index_->byIdentifier[identifier] = found_.back();
        index_->byFile[hostFile] = found_.back();
    }

    DesktopEntries& entries_;
    const std::shared_ptr<Index> index_ = std::make_shared<Index>();
    std::vector<DesktopApplicationEntryRef> found_;  // the most important first
    std::set<std::string> identifiers_;
    std::size_t count_ = 0;
};

DesktopApplicationEntryRef DesktopEntries::withIdentifier(std::string_view identifier) {
    const auto known = index();
    const auto found = known->byIdentifier.find(identifier);
    return found != known->byIdentifier.end() ? found->second : nullptr;
}

DesktopApplicationEntryRef DesktopEntries::inFile(std::string_view hostFile) {
    const auto known = index();
    const auto found = known->byFile.find(hostFile);
    return found != known->byFile.end() ? found->second : nullptr;
}

DesktopApplicationEntryRef DesktopEntries::ofProgram(std::string_view hostPath) {
    const auto known = index();
    const auto found = known->byProgram.find(hostPath);
    return found != known->byProgram.end() ? found->second : nullptr;
}

/// A change right before the look may hide another one of the same time right after it.
bool DesktopEntries::isCurrent(const Index& index) {
    return std::all_of(index.folders.begin(), index.folders.end(), [&](const auto& folder) {
        const auto& [path, change] = folder;
        return changeOf(path) == change && change < index.begun - kFinestTime;
    });
}

std::shared_ptr<const DesktopEntries::Index> DesktopEntries::index() {
    auto known = index_.copy();
    if (known && isCurrent(*known)) return known;
    auto fresh = Scan(*this).run();
    index_.set(fresh);
    return fresh;
}

/// Where the program that an entry names is, through links; empty when it is nowhere.
std::string DesktopEntries::programFile(const std::string& program) const {
    if (program.find('/') != std::string::npos) return resolved(program);
    for (const std::string& folder : folders_.programs) {
        std::string file = resolved((fs::path(folder) / program).string());
        if (!file.empty()) return file;
    }
    return {};
}

}  // namespace kelvo
