#include "daemon/Options.h"

#include <cerrno>
#include <optional>
#include <string_view>

namespace kelvo {
namespace {

KVError wrong(const std::string& what) {
    return {std::string(kPOSIXErrorDomain), EINVAL, {{std::string(kLocalizedDescriptionKey), what}}};
}

/// Goes through the arguments; an option's value may stand behind "=" or be the next argument.
class OptionReader {
  public:
    explicit OptionReader(std::span<const char* const> arguments) : rest_(arguments) {}

    Result<Options> read() {
        while (!rest_.empty()) {
            if (const OptionalError error = readOne()) return *error;
        }
        options_.logsSamples = !leavesSamplesOut_;
        return options_;
    }

  private:
    OptionalError readOne() {
        const std::string_view argument = next();
        const std::size_t equals = argument.find('=');
        name_ = argument.substr(0, equals);
        inlineValue_.reset();
        if (equals != std::string_view::npos) inlineValue_ = argument.substr(equals + 1);
        if (name_ == "--help" || name_ == "-h") return choose(Options::Action::showHelp);
        if (name_ == "--version") return choose(Options::Action::showVersion);
        if (name_ == "--root") return readText(options_.root);
        if (name_ == "--resources") return readText(options_.resourceFolder);
        if (name_ == "--log") return readLog();
        if (name_ == "--no-sample-log") return readFlag(leavesSamplesOut_);
        if (name_ == "--user-videos") return readFlag(options_.savesToUsersVideos);
        if (argument.starts_with("-")) return wrong("unknown option " + name_);
        return wrong("unexpected argument " + std::string(argument));
    }

    OptionalError choose(Options::Action action) {
        if (inlineValue_) return wrong(name_ + " takes no value");
        options_.action = action;
        return std::nullopt;
    }

    OptionalError readFlag(bool& flag) const {
        if (inlineValue_) return wrong(name_ + " takes no value");
        flag = true;
        return std::nullopt;
    }

    OptionalError readText(std::string& text) {
        if (!inlineValue_ && !rest_.empty()) inlineValue_ = next();
        if (!inlineValue_ || inlineValue_->empty()) return wrong(name_ + " needs a folder");
        text = *inlineValue_;
        return std::nullopt;
    }

    OptionalError readLog() {
        std::string sink;
        if (readText(sink) || (sink != "journal" && sink != "stderr")) {
            return wrong("--log needs \"journal\" or \"stderr\"");
        }
        options_.log = sink == "stderr" ? Options::Log::standardError : Options::Log::journal;
        return std::nullopt;
    }

    std::string_view next() {
        const std::string_view argument = rest_.front();
        rest_ = rest_.subspan(1);
        return argument;
    }

    std::span<const char* const> rest_;
    Options options_;
    bool leavesSamplesOut_ = false;
    std::string name_;
    std::optional<std::string> inlineValue_;
};

}  // namespace

Result<Options> Options::parse(std::span<const char* const> arguments) {
    return OptionReader(arguments).read();
}

const char* Options::helpText() {
    return "Usage: kelvod [--root DIR] [--user-videos] [--log journal|stderr] [--no-sample-log] [--resources "
           "DIR]\n"
           "\n"
           "Records the screen for the applications and the shell of this device.\n"
           "\n"
           "  --root DIR         keep everything of the device under DIR instead of /\n"
           "  --user-videos      save recordings to the own videos folder of the user who runs the daemon, "
           "not\n"
           "                     to the one under DIR\n"
           "  --log SINK         log to the journal (the default) or to standard error\n"
           "  --no-sample-log    leave out what becomes of each picture and piece of sound, over 300 lines "
           "a\n"
           "                     second while a recording runs\n"
           "  --resources DIR    the folder with KelvoKit.framework, if not the installed one\n"
           "  --version          print the version and exit\n"
           "  --help             print this and exit\n"
           "\n"
           "SIGTERM, SIGINT and SIGHUP end the daemon. The exit status is 0 then, 1 when it cannot start,\n"
           "2 for a wrong command line.\n";
}

}  // namespace kelvo
