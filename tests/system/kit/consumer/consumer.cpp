#include <cstdio>
#include <future>
#include <kelvokit/KelvoKit.h>

int main() {
    kelvokit::Recorder recorder;
    std::promise<kelvokit::Error> failed;
    recorder.discard([&](const auto& error) { failed.set_value(error.value_or(kelvokit::Error())); });
    const kelvokit::Error error = failed.get_future().get();
    std::printf("%lld %s\n", static_cast<long long>(error.code), error.description.c_str());
}
