#include "ChildProcess.h"

#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <sys/wait.h>
#include <unistd.h>

namespace kelvo::test {

ChildProcess::ChildProcess(const std::vector<std::string>& arguments, const std::vector<int>& inherited) {
    std::vector<char*> words;
    words.reserve(arguments.size() + 1);
    for (const std::string& argument : arguments)
        words.push_back(const_cast<char*>(argument.c_str()));
    words.push_back(nullptr);
    pid_ = ::fork();
    if (pid_ != 0) return;
    for (const int descriptor : inherited)
        ::fcntl(descriptor, F_SETFD, 0);
    ::execvp(words[0], words.data());
    ::_exit(127);
}

ChildProcess::~ChildProcess() {
    kill();
}

void ChildProcess::signal(int number) const {
    if (pid_ > 0) ::kill(pid_, number);
}

void ChildProcess::kill() {
    if (pid_ <= 0) return;
    signal(SIGKILL);
    while (::waitpid(pid_, nullptr, 0) < 0 && errno == EINTR) {
    }
    pid_ = -1;
}

}  // namespace kelvo::test
