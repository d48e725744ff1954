#pragma once

#include "base/Guarded.h"
#include "platform/linux/bundles/DesktopEntryFile.h"
#include "platform/linux/bundles/DesktopFolders.h"

#include <filesystem>
#include <map>
#include <memory>
#include <set>
#include <string>
#include <string_view>
#include <vector>

namespace kelvo {

/// One application of the desktop.
struct DesktopApplicationEntry {
    std::string identifier;  ///< the file's path below "applications", "-" for "/", without ".desktop"
    std::string hostFile;
    DesktopEntryFile file;
};
using DesktopApplicationEntryRef = std::shared_ptr<const DesktopApplicationEntry>;

/// The applications that desktop entries tell of: those with a program that has windows. Of two files with
/// one identifier the one of the more important folder counts. A program that several start is that of the
/// one which starts it without options, then of the more important folder. Identifiers that begin with
/// "com.quillon." are the system's own, and no entry has one.
///
/// What the files say is kept until a file comes or goes. At most 4096 files are looked at, four folders
/// deep; a malformed one is logged and passed over. Thread-safe.
class DesktopEntries {
  public:
    explicit DesktopEntries(DesktopFolders folders) : folders_(std::move(folders)) {}

    /// None when there is none.
    DesktopApplicationEntryRef withIdentifier(std::string_view identifier);
    DesktopApplicationEntryRef inFile(std::string_view hostFile);
    /// The one whose program is the file at this path. A script is never one: what runs it is another
    /// program.
    DesktopApplicationEntryRef ofProgram(std::string_view hostPath);

    const DesktopFolders& folders() const { return folders_; }

  private:
    using Times = std::map<std::string, std::filesystem::file_time_type>;
    struct Index {
        std::filesystem::file_time_type begun;
        Times folders;  ///< every folder that was looked into, with its time of change
        std::map<std::string, DesktopApplicationEntryRef, std::less<>> byIdentifier;
        std::map<std::string, DesktopApplicationEntryRef, std::less<>> byFile;
        std::map<std::string, DesktopApplicationEntryRef, std::less<>> byProgram;
    };
    class Scan;

    static bool isCurrent(const Index& index);
    std::shared_ptr<const Index> index();
    std::string programFile(const std::string& program) const;

    const DesktopFolders folders_;
    Guarded<std::shared_ptr<const Index>> index_;
    Guarded<std::set<std::string>> malformed_;  ///< what the log knows of
};

}  // namespace kelvo
