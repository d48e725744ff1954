#include "tools/kelvoctl/Commands.h"

#include "base/KVError.h"

namespace kelvo::ctl {
namespace {

bool isTrue(const Dictionary& dictionary, std::string_view key) {
    const Value* const value = dictionary.find(key);
    return value != nullptr && value->asBool().value_or(false);
}

std::string textUnder(const Dictionary& dictionary, std::string_view key) {
    const Value* const value = dictionary.find(key);
    const std::string* const text = value != nullptr ? value->asString() : nullptr;
    return text != nullptr ? *text : "";
}

std::string stateText(const Dictionary& state) {
    if (!isTrue(state, "isRecording")) return "nothing is being recorded";
    std::string text = isTrue(state, "isBroadcasting") ? "broadcasting" : "recording";
    text += isTrue(state, "isSystemRecording") ? " the whole screen" : " an application";
    text += isTrue(state, "microphoneEnabled") ? ", with the microphone" : ", without the microphone";
    const Value* const url = state.find("broadcastURL");
    if (url != nullptr && url->as<URL>() != nullptr)
        text += ", to be watched at " + url->as<URL>()->absoluteString();
    return text;
}

/// Pause and resume have no answer, and the daemon passes over those of a system recording, which is the only
/// kind that the shell has: the state tells what came of them.
void tellAfter(Program& program, const char* done) {
    program.daemon().synchronousGetCurrentState(program.onMain([&program, done](const auto& state) {
        if (!state || !isTrue(*state, "isRecording"))
            return program.fail("nothing is being recorded", kNothingToDo);
        if (isTrue(*state, "isSystemRecording")) {
            return program.fail(
                std::string("the daemon does not ") + done + " a recording of the whole screen; it goes on",
                kRefused);
        }
        program.finish(kDone);
    }));
}

}  // namespace

std::shared_ptr<void> beginCommand(Program& program) {
    switch (program.line().command) {
        case Command::record:
            return beginRecord(program);
        case Command::stop:
            return beginStop(program);
        case Command::pause:
            return beginPause(program);
        case Command::resume:
            return beginResume(program);
        case Command::status:
            return beginStatus(program);
        case Command::extensions:
            return beginExtensions(program);
        case Command::library:
            return beginLibrary(program);
        case Command::watch:
            return beginWatch(program);
        case Command::shell:
            return beginShell(program);
        case Command::none:
            break;
    }
    program.finish(kWrongUsage);
    return nullptr;
}

std::shared_ptr<void> beginPause(Program& program) {
    program.daemon().pauseRecording();
    tellAfter(program, "pause");
    return nullptr;
}

std::shared_ptr<void> beginResume(Program& program) {
    program.daemon().resumeRecordingWithWindowLayerContextID(0);
    tellAfter(program, "resume");
    return nullptr;
}

std::shared_ptr<void> beginStatus(Program& program) {
    program.daemon().synchronousGetCurrentState(program.onMain([&program](const auto& state) {
        if (!state)
            return program.fail("the daemon does not take this program for the system shell", kRefused);
        program.answer(stateText(*state), *state);
        program.finish(kDone);
    }));
    return nullptr;
}

std::shared_ptr<void> beginExtensions(Program& program) {
    program.daemon().getSystemBroadcastExtensionInfo(
        program.onMain([&program](const auto& extensions, const OptionalError& error) {
            if (error) return program.fail(*error);
            for (const Dictionary& each : extensions)
                program.answer(textUnder(each, "displayName") + "\t" + textUnder(each, "extBundleID"), each);
            if (extensions.empty()) program.remark("no broadcast extension is installed");
            program.finish(kDone);
        }));
    return nullptr;
}

std::shared_ptr<void> beginWatch(Program& program) {
    program.setCallbackHandler([&program](const std::string& name, const Dictionary& arguments) {
        Dictionary line{{"callback", name}};
        line.merge(arguments);
        program.answer(arguments.empty() ? name : name + " " + Value(arguments).description(), line);
    });
    // An answer shows that the daemon listens to this connection: whatever comes from now on is seen.
    program.daemon().synchronousGetCurrentState(
        program.onMain([&program](const auto&) { program.remark("watching; Ctrl-C ends"); }));
    return nullptr;
}

}  // namespace kelvo::ctl
