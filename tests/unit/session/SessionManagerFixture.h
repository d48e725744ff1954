#pragma once

#include "platform/simulated/SimulatedBundles.h"
#include "session/KVSessionManager.h"
#include "support/FakeRecordingSession.h"
#include "support/LogRecorder.h"

#include <string>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo::test {

using Texts = std::vector<std::string>;
using FakeSessionRef = std::shared_ptr<FakeRecordingSession>;

inline const std::string kShell = "com.quillon.plinth";
inline const std::string kPicker = "com.quillon.KelvoKit.KVBroadcastPicker";
inline const URL kMovie = URL::file("/store//movie.mp4");
inline const KVError kFailure("com.example", -7);

/// A delegate that writes its part of the fixture's diary.
class DiaryDelegate : public KVSessionManagerDelegate {
  public:
    explicit DiaryDelegate(Texts& diary) : diary_(diary) {}

    void prepareForStoppingSession(const SessionRef& session) override { note("prepare", session); }
    void resetStatesForSession(const SessionRef& session) override { note("reset", session); }
    void recordingSessionStoppedWithError(const SessionRef& session, const OptionalError& error,
                                          const std::optional<URL>& movieURL) override {
        note("stopped", session);
        stopErrors.push_back(error);
        stopMovies.push_back(movieURL);
    }
    void failedToSaveRecordingForRecordingSession(const SessionRef& session, const KVError& error) override {
        note("failed to save", session);
        saveFailures.push_back(error);
    }
    void saveVideoToCameraRoll(const std::optional<URL>& movieURL, ErrorHandler completion) override {
        diary_.push_back("save " + (movieURL ? movieURL->absoluteString() : "nothing"));
        saveCompletions.push_back(std::move(completion));
    }

    std::vector<OptionalError> stopErrors;
    std::vector<std::optional<URL>> stopMovies;
    std::vector<KVError> saveFailures;
    std::vector<ErrorHandler> saveCompletions;

  private:
    void note(const std::string& event, const SessionRef& session) {
        diary_.push_back(event + " " + (session ? session->bundleID() : "nothing"));
    }

    Texts& diary_;
};

/// A session manager of fake sessions, and one diary of what it told sessions, clients and its delegate.
class SessionManagerFixture : public testing::Test {
  protected:
    SessionManagerFixture() {
        manager.setDelegate(delegate);
        SimulatedBundleContent framework;
        for (const char* key : {"INTERRUPTED", "CONTENT_RESIZE", "SYSTEM_DORMANCY"})
            framework.tables["en"]["Localizable"]["RECORDING_ERROR_" + std::string(key)] = key;
        bundles->addBundle("/System/Library/Frameworks/KelvoKit.framework", framework);
    }

    /// A finish that is never completed holds its session.
    ~SessionManagerFixture() override {
        for (const FakeSessionRef& session : sessions_) {
            session->finish = nullptr;
            session->cleanup = nullptr;
        }
    }

    /// The session of a client that records.
    FakeSessionRef recording(const std::string& bundleID) {
        auto session = std::static_pointer_cast<FakeRecordingSession>(
            manager.recordingSessionInstanceWithBundleIdentifier(bundleID));
        session->recording = true;
        session->systemRecording = session->bundleID() == kShell;
        return session;
    }
    FakeSessionRef idle(const std::string& bundleID) {
        auto session = recording(bundleID);
        session->recording = false;
        return session;
    }

    /// A handler that writes its outcome into the diary.
    MovieHandler noteOutcome() {
        return [this](const std::optional<URL>& movieURL, const OptionalError& error) {
            diary.push_back("handler (" + (movieURL ? movieURL->absoluteString() : "none") + ", " +
                            (error ? std::to_string(error->code()) : "none") + ")");
        };
    }

    Texts diary;
    LogRecorder log;
    std::shared_ptr<DiaryDelegate> delegate = std::make_shared<DiaryDelegate>(diary);
    std::shared_ptr<SimulatedBundles> bundles = std::make_shared<SimulatedBundles>();
    Texts createdSessions;
    KVSessionManager manager{[this](const std::string& bundleID) { return makeSession(bundleID); },
                             std::make_shared<KVUserErrors>(std::make_shared<KVLocalization>(
                                 bundles, std::make_shared<SimulatedLanguages>()))};

  private:
    SessionRef makeSession(const std::string& bundleID) {
        createdSessions.push_back(bundleID);
        auto session = std::make_shared<FakeRecordingSession>(bundleID);
        session->onRequest = [this, bundleID](const auto& request) {
            diary.push_back(bundleID + ": " + request);
        };
        session->client->onMessage = [this, bundleID](const auto& message) {
            diary.push_back(bundleID + "'s client: " + message);
        };
        sessions_.push_back(session);
        return session;
    }

    std::vector<FakeSessionRef> sessions_;
};

}  // namespace kelvo::test
