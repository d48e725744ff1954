// An application that ends while a handler of its recorder runs.
//
//   exiting_client inside|outside SOCKET      the handler ends it with 4; the main thread does with 3
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <future>
#include <kelvokit/KelvoKit.h>

int main(int argumentCount, char** arguments) {
    if (argumentCount != 3) return 2;
    const bool isInside = std::strcmp(arguments[1], "inside") == 0;
    std::promise<void> running;
    std::promise<void> never;
    kelvokit::Recorder recorder({.socketPath = arguments[2], .executor = {}});
    recorder.isBroadcasting("any", [&](bool, const auto& error) {
        std::fprintf(stderr, "%s\n", error ? error->detail.c_str() : "answered");
        if (isInside) std::exit(4);  // NOLINT(concurrency-mt-unsafe): the main thread waits
        running.set_value();
        never.get_future().wait();
    });
    running.get_future().wait();
    std::exit(3);  // NOLINT(concurrency-mt-unsafe): the recorder stays as it is
}
