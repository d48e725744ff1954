#include "tools/kelvoctl/CommandLine.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <charconv>
#include <cmath>
#include <string_view>

namespace kelvo::ctl {
namespace {

constexpr double kLongestRecording = 7 * 24 * 3600;
constexpr double kLargestSide = 16384;

struct CommandText {
    Command command;
    std::string_view name;
    std::string_view options;  ///< space-separated; those that every command takes are left out
    std::string_view summary;
    std::string_view help;
};

constexpr std::array<CommandText, 9> kCommands{{
    {Command::record, "record", "--seconds --microphone --output --size",
     "record the whole screen until Ctrl-C",
     "Usage: kelvoctl record [--seconds N] [--microphone] [--output FILE] [--size WxH]\n"
     "\n"
     "Records the whole screen and the sound of the application in front, until Ctrl-C, until N seconds "
     "have\n"
     "passed, or until somebody else stops it. The movie is then saved to the library.\n"
     "\n"
     "  --seconds N      stop after N seconds (fractions are fine)\n"
     "  --microphone     record the microphone, too\n"
     "  --output FILE    put the movie here instead of saving it, as it was recorded: the microphone and "
     "the\n"
     "                   application stay tracks of their own. FILE must not exist yet\n"
     "  --size WxH       the movie's size; the screen's without it\n"
     "\n"
     "On a terminal a timer shows how long it runs; closing it stops and saves, as\n"
     "Ctrl-C does. A second Ctrl-C leaves without waiting for the saving; the daemon goes on with it.\n"
     "\n"
     "Examples:\n"
     "  kelvoctl record --seconds 10\n"
     "  kelvoctl record --microphone --output talk.mp4\n"},
    {Command::stop, "stop", "--output", "stop the recording of the screen and save it",
     "Usage: kelvoctl stop [--output FILE]\n"
     "\n"
     "Stops the recording of the screen that runs, whoever started it, and saves the movie to the library.\n"
     "\n"
     "  --output FILE    put the movie here instead, as it was recorded. FILE must not exist yet\n"},
    {Command::pause, "pause", "", "pause the recording",
     "Usage: kelvoctl pause\n"
     "\n"
     "Asks the daemon to pause the recording. It pauses applications' recordings of themselves only: a\n"
     "recording of the whole screen goes on, and this command says so with exit status 1.\n"},
    {Command::resume, "resume", "", "go on with a paused recording",
     "Usage: kelvoctl resume\n"
     "\n"
     "Asks the daemon to go on with a paused recording. As with pause, a recording of the whole screen "
     "takes\n"
     "no notice, and the exit status is 1.\n"},
    {Command::status, "status", "", "tell what is being recorded",
     "Usage: kelvoctl status [--json]\n"
     "\n"
     "Tells whether the screen is being recorded or broadcast, and with which settings. The exit status is "
     "0\n"
     "in either case; with --json one object is printed that has the daemon's own keys (\"isRecording\",\n"
     "\"microphoneEnabled\", …).\n"},
    {Command::extensions, "extensions", "", "list the broadcast extensions",
     "Usage: kelvoctl extensions [--json]\n"
     "\n"
     "Lists the broadcast upload extensions that are installed: name and bundle identifier.\n"},
    {Command::library, "library", "", "list the saved movies, or save what a crash left",
     "Usage: kelvoctl library [recover] [--json]\n"
     "\n"
     "Lists the movies of the library, oldest first: when each was recorded, its size and its file. With "
     "--json\n"
     "each is an object with \"identifier\", \"path\", \"creationDate\" (seconds since 1970) and \"size\".\n"
     "\n"
     "  recover          save the movies that a crash or a log-out left, and recordings of the whole screen\n"
     "                   that a lost display ended, and take them out of the daemon's store. The exit "
     "status\n"
     "                   is 1 when one cannot be saved; it stays in the store then\n"},
    {Command::watch, "watch", "", "print what the daemon tells the shell, as it comes",
     "Usage: kelvoctl watch [--json]\n"
     "\n"
     "Prints a line for each callback of the daemon, with its arguments, until Ctrl-C. With --json each line "
     "is\n"
     "an object with \"callback\" and its arguments.\n"
     "\n"
     "Example:\n"
     "  kelvoctl watch --json | jq -r .callback\n"},
    {Command::shell, "shell", "--answer", "show the system's alerts here and answer them",
     "Usage: kelvoctl shell [--answer default|alternate|other|cancel] [--json]\n"
     "\n"
     "Shows the alerts with which the daemon asks the user, here on the terminal, until Ctrl-C. The keys d, "
     "a and\n"
     "o press the button whose letter stands before it, c takes the alert away unanswered. As long as no "
     "shell\n"
     "runs, whatever needs consent is refused; one shell at a time can run.\n"
     "\n"
     "  --answer BUTTON  answer every alert at once with this button, for scripts. An alert without it is\n"
     "                   taken away. In the alert that asks for consent \"default\" declines\n"
     "\n"
     "With --json each alert is an object with \"alert\" (its number), \"header\", \"message\" and "
     "\"buttons\"; what\n"
     "became of it follows as \"answered\" or \"withdrawn\" with that number.\n"},
}};

const CommandText* textOf(Command command) {
    const auto found = std::ranges::find(kCommands, command, &CommandText::command);
    return found == kCommands.end() ? nullptr : &*found;
}

const CommandText* textNamed(std::string_view name) {
    const auto found = std::ranges::find(kCommands, name, &CommandText::name);
    return found == kCommands.end() ? nullptr : &*found;
}

KVError wrong(const std::string& what) {
    return {std::string(kPOSIXErrorDomain), EINVAL, {{std::string(kLocalizedDescriptionKey), what}}};
}

std::optional<double> numberIn(std::string_view text) {
    double number = 0;
    const char* const end = text.data() + text.size();
    const auto [rest, error] = std::from_chars(text.data(), end, number);
    if (error != std::errc() || rest != end || !std::isfinite(number)) return std::nullopt;
    return number;
}

/// "1080x1920".
std::optional<Size> sizeIn(std::string_view text) {
    const std::size_t cross = text.find('x');
    if (cross == std::string_view::npos) return std::nullopt;
    const auto width = numberIn(text.substr(0, cross));
    const auto height = numberIn(text.substr(cross + 1));
    const auto isSide = [](const auto& side) { return side && *side >= 2 && *side <= kLargestSide; };
    return isSide(width) && isSide(height) ? std::optional<Size>({*width, *height}) : std::nullopt;
}

/// Goes through the arguments; an option's value may stand behind "=" or be the next argument.
class Reader {
  public:
    explicit Reader(std::span<const char* const> arguments) : rest_(arguments) {}

    Result<CommandLine> read() {
        while (!rest_.empty()) {
            if (const OptionalError error = readOne()) return *error;
        }
        if (line_.wantsHelp || line_.wantsVersion) return line_;
        if (line_.command == Command::none) return wrong("what to do? kelvoctl --help tells the commands");
        return check();
    }

  private:
    OptionalError readOne() {
        const std::string_view argument = next();
        if (!argument.starts_with("-")) return readCommand(argument);
        const std::size_t equals = argument.find('=');
        name_ = argument.substr(0, equals);
        value_.reset();
        if (equals != std::string_view::npos) value_ = argument.substr(equals + 1);
        if (name_ == "--help" || name_ == "-h") return readFlag(line_.wantsHelp);
        if (name_ == "--version") return readFlag(line_.wantsVersion);
        if (name_ == "--json") return readFlag(line_.isJson);
        if (name_ == "--socket") return readText(line_.socket, "a path");
        given_.push_back(name_);
        if (name_ == "--microphone") return readFlag(line_.wantsMicrophone);
        if (name_ == "--output") return readText(line_.output, "a file");
        if (name_ == "--seconds") return readSeconds();
        if (name_ == "--size") return readSize();
        if (name_ == "--answer") return readAnswer();
        return wrong("unknown option " + name_);
    }

    OptionalError readCommand(std::string_view name) {
        if (line_.command == Command::library && !line_.isRecovery && name == "recover") {
            line_.isRecovery = true;
            return std::nullopt;
        }
        if (line_.command != Command::none) return wrong("unexpected argument " + std::string(name));
        const CommandText* const text = textNamed(name);
        if (text == nullptr) return wrong("unknown command " + std::string(name));
        line_.command = text->command;
        return std::nullopt;
    }

    OptionalError readFlag(bool& flag) const {
        if (value_) return wrong(name_ + " takes no value");
        flag = true;
        return std::nullopt;
    }

    OptionalError readText(std::string& text, const char* what) {
        if (!value_ && !rest_.empty()) value_ = next();
        if (!value_ || value_->empty()) return wrong(name_ + " needs " + what);
        text = *value_;
        return std::nullopt;
    }

    OptionalError readSeconds() {
        std::string text;
        if (OptionalError error = readText(text, "a number of seconds")) return error;
        line_.seconds = numberIn(text);
        if (!line_.seconds || *line_.seconds <= 0 || *line_.seconds > kLongestRecording)
            return wrong("--seconds needs a number above 0 and at most a week's, not " + text);
        return std::nullopt;
    }

    OptionalError readSize() {
        std::string text;
        if (OptionalError error = readText(text, "a size such as 1080x1920")) return error;
        line_.size = sizeIn(text);
        if (!line_.size) return wrong("--size needs a size such as 1080x1920, not " + text);
        return std::nullopt;
    }

    OptionalError readAnswer() {
        constexpr std::array<std::string_view, 4> names{"default", "alternate", "other", "cancel"};
        std::string text;
        if (OptionalError error = readText(text, "a button")) return error;
        const auto found = std::ranges::find(names, text);
        if (found == names.end())
            return wrong("--answer needs default, alternate, other or cancel, not " + text);
        line_.answer = static_cast<SystemAlertResponse>(found - names.begin());
        return std::nullopt;
    }

    Result<CommandLine> check() const {
        const CommandText* const text = textOf(line_.command);
        for (const std::string& option : given_) {
            if ((" " + std::string(text->options) + " ").find(" " + option + " ") == std::string::npos)
                return wrong(std::string(text->name) + " takes no " + option);
        }
        return line_;
    }

    std::string_view next() {
        const std::string_view argument = rest_.front();
        rest_ = rest_.subspan(1);
        return argument;
    }

    std::span<const char* const> rest_;
    CommandLine line_;
    std::string name_;
    std::optional<std::string> value_;
    std::vector<std::string> given_;
};

constexpr std::string_view kOverview =
    "\n"
    "Options of every command:\n"
    "  --json           print JSON, one value a line; errors as {\"error\": {…}}\n"
    "  --socket PATH    the daemon's socket. Without it: KELVO_SOCKET, else the user's\n"
    "                   ($XDG_RUNTIME_DIR/kelvod/com.quillon.kelvod) if there is one, else\n"
    "                   /run/kelvod/com.quillon.kelvod. kelvod --root DIR listens at\n"
    "                   DIR/run/kelvod/com.quillon.kelvod\n"
    "  --version        print the version and exit\n"
    "  --help           print this, or what one command does, and exit\n"
    "\n"
    "Exit status: 0 done; 1 the daemon answered with an error, which is printed, or the recording failed;\n"
    "2 wrong arguments; 3 no daemon answers, or it went away; 4 nothing is being recorded (or, to record,\n"
    "something already is).\n"
    "\n"
    "kelvoctl acts for the system shell: its rights are those of the bundle folder it lies in\n"
    "(com.quillon.plinth), and count while only root or the daemon's own user can write to that folder.\n"
    "Run a copy of the folder, not of the program alone.\n";

}  // namespace

Result<CommandLine> CommandLine::parse(std::span<const char* const> arguments) {
    return Reader(arguments).read();
}

std::string CommandLine::helpText(Command command) {
    if (const CommandText* const text = textOf(command)) return std::string(text->help);
    std::string all =
        "Usage: kelvoctl COMMAND [options]\n\nRecords the screen of this device through its daemon, "
        "kelvod.\n\n";
    for (const CommandText& each : kCommands) {
        all += "  " + std::string(each.name) + std::string(13 - each.name.size(), ' ');
        all += std::string(each.summary) + "\n";
    }
    return all + "\nkelvoctl COMMAND --help tells more about one of them.\n" + std::string(kOverview);
}

}  // namespace kelvo::ctl
