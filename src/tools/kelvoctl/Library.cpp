#include "ipc/KVLibraryProtocol.h"
#include "tools/kelvoctl/Commands.h"
#include "tools/kelvoctl/DaemonSocket.h"

#include <array>
#include <cerrno>
#include <cstdio>

namespace kelvo::ctl {
namespace {

std::string textUnder(const Dictionary& movie, std::string_view key) {
    const Value* const value = movie.find(key);
    const std::string* const text = value != nullptr ? value->asString() : nullptr;
    return text != nullptr ? *text : "";
}

/// "12.3 MB".
std::string sizeText(const Dictionary& movie) {
    const Value* const value = movie.find("size");
    std::array<char, 32> text{};
    std::snprintf(text.data(), text.size(), "%.1f MB",
                  value != nullptr ? value->asDouble().value_or(0) / 1e6 : 0.0);
    return text.data();
}

std::string dateText(const Dictionary& movie) {
    const Value* const value = movie.find("creationDate");
    const Date* const date = value != nullptr ? value->as<Date>() : nullptr;
    return date != nullptr ? localTimeText(*date, "%Y-%m-%d %H:%M") : "";
}

/// One question to the library's service. Main thread.
class Library {
  public:
    explicit Library(Program& program) : program_(program) {}

    void begin() {
        const auto connection = program_.open(librarySocket(program_.line().socket), nullptr, nullptr,
                                              interfaceOf<KVLibraryProtocol>());
        if (!connection) return;
        service_ = std::make_unique<RemoteLibrary>(*connection, program_.deliveryErrorHandler());
        if (program_.line().isRecovery) {
            service_->recoverMovies(handler(&Library::tellRecovered));
        } else {
            service_->listMovies(handler(&Library::tellListed));
        }
    }

  private:
    using Tell = void (Library::*)(const std::vector<Dictionary>&);

    KVLibraryProtocol::MoviesHandler handler(Tell tell) {
        return program_.onMain([this, tell](const std::vector<Dictionary>& movies,
                                            const OptionalError& error) {
            if (!error) return (this->*tell)(movies);
            if (error->code() == EPERM) {
                return program_.fail("the daemon does not take this program for the system shell", kRefused);
            }
            if (error->code() == EBUSY && program_.line().isRecovery)
                return program_.fail("somebody else recovers movies now", kRefused);
            program_.fail(*error);
        });
    }

    void tellListed(const std::vector<Dictionary>& movies) {
        for (const Dictionary& each : movies)
            program_.answer(dateText(each) + "  " + sizeText(each) + "  " + textUnder(each, "path"), each);
        if (movies.empty()) program_.remark("the library is empty");
        program_.finish(kDone);
    }

    void tellRecovered(const std::vector<Dictionary>& movies) {
        int status = kDone;
        for (const Dictionary& each : movies) {
            const Value* const failure = each.find("error");
            const KVError* const error = failure != nullptr ? failure->asError() : nullptr;
            program_.answer(
                error == nullptr
                    ? "saved " + textUnder(each, "name") + " to " + textUnder(each, "path")
                    : "cannot save " + textUnder(each, "name") + ": " + error->localizedDescription(),
                each);
            if (error != nullptr) status = kRefused;
        }
        if (movies.empty()) program_.remark("there is nothing to recover");
        program_.finish(status);
    }

    Program& program_;
    std::unique_ptr<RemoteLibrary> service_;
};

}  // namespace

std::shared_ptr<void> beginLibrary(Program& program) {
    const auto library = std::make_shared<Library>(program);
    library->begin();
    return library;
}

}  // namespace kelvo::ctl
