#include "platform/linux/library/MovieLibrary.h"
#include "platform/linux/system/KernelRandom.h"

#include <cstdio>
#include <vector>

/// library_program FOLDER MOVIE...: adds the movies to the library in FOLDER, then removes the first one
/// again, and so on until it is killed.
int main(int count, char** arguments) {
    if (count < 3) return 2;
    kelvo::MovieLibrary library(arguments[1], std::make_shared<kelvo::KernelRandom>());
    std::fputs("begins\n", stderr);
    for (;;) {
        std::vector<std::string> added;
        for (int i = 2; i < count; ++i) {
            const auto identifier = library.add(arguments[i]);
            if (!identifier) return 1;
            added.push_back(*identifier);
        }
        if (library.remove(added.front())) return 1;
    }
}
