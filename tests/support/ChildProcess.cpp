#include "ChildProcess.h"

#include <algorithm>
#include <array>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <poll.h>
#include <sys/wait.h>
#include <unistd.h>

namespace kelvo::test {
namespace {

constexpr std::chrono::seconds kPatience{10};

std::chrono::steady_clock::time_point patienceEnds() {
    return std::chrono::steady_clock::now() + kPatience;
}

[[noreturn]] void become(const std::vector<std::string>& command,
                         const std::map<std::string, std::string>& environment) {
    for (const auto& [name, value] : environment)
        ::setenv(name.c_str(), value.c_str(), 1);
    std::vector<char*> arguments;
    for (const std::string& word : command)
        arguments.push_back(const_cast<char*>(word.c_str()));
    arguments.push_back(nullptr);
    ::execvp(arguments[0], arguments.data());
    ::_exit(127);
}

}  // namespace

ChildProcess::ChildProcess(const std::vector<std::string>& command,
                           const std::map<std::string, std::string>& environment) {
    std::array<int, 2> pipe{-1, -1};
    if (::pipe2(pipe.data(), O_CLOEXEC) != 0) return;
    processIdentifier_ = ::fork();
    if (processIdentifier_ == 0) {
        ::dup2(pipe[1], STDERR_FILENO);
        become(command, environment);
    }
    ::close(pipe[1]);
    standardError_.reset(pipe[0]);
}

ChildProcess::~ChildProcess() {
    if (processIdentifier_ < 0) return;
    ::kill(processIdentifier_, SIGKILL);
    ::waitpid(processIdentifier_, nullptr, 0);
}

void ChildProcess::signal(int number) const {
    if (processIdentifier_ > 0) ::kill(processIdentifier_, number);  // -1 would be everybody
}

bool ChildProcess::readMore(Deadline deadline) {
    const auto left =
        std::chrono::duration_cast<std::chrono::milliseconds>(deadline - std::chrono::steady_clock::now());
    pollfd source{standardError_.get(), POLLIN, 0};
    if (::poll(&source, 1, static_cast<int>(std::max<std::int64_t>(left.count(), 0))) <= 0) return false;
    std::array<char, 4096> buffer;
    const ssize_t count = ::read(standardError_.get(), buffer.data(), buffer.size());
    if (count <= 0) return false;
    output_.append(buffer.data(), static_cast<std::size_t>(count));
    return true;
}

bool ChildProcess::waitForLine(const std::string& text) {
    const Deadline deadline = patienceEnds();
    while (true) {
        const std::size_t found = output_.find(text);
        if (found != std::string::npos && output_.find('\n', found) != std::string::npos) return true;
        if (!readMore(deadline)) return false;
    }
}

std::optional<int> ChildProcess::waitForExit() {
    const Deadline deadline = patienceEnds();
    while (readMore(deadline)) {
    }
    if (std::chrono::steady_clock::now() >= deadline || processIdentifier_ < 0) return std::nullopt;
    int status = 0;
    ::waitpid(processIdentifier_, &status, 0);
    processIdentifier_ = -1;
    return WIFEXITED(status) ? std::optional(WEXITSTATUS(status)) : std::nullopt;
}

}  // namespace kelvo::test
