#include "ipc/KVUserErrors.h"
#include "platform/simulated/SimulatedBundles.h"

#include <limits>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

const std::string kDescriptionKey(kLocalizedDescriptionKey);

struct Row {
    std::int64_t code;
    const char* messageKey;
    friend void PrintTo(const Row& row, std::ostream* out) { *out << row.code << " " << row.messageKey; }
};

/// A framework whose text for each key is the key in angle brackets.
class ErrorsFixture {
  protected:
    void addText(const std::string& key) { content_.tables["en"]["Localizable"][key] = "<" + key + ">"; }
    KVUserErrors errors() {
        const auto bundles = std::make_shared<SimulatedBundles>();
        bundles->addBundle("/System/Library/Frameworks/KelvoKit.framework", content_);
        return KVUserErrors(
            std::make_shared<KVLocalization>(bundles, std::make_shared<SimulatedLanguages>()));
    }

  private:
    SimulatedBundleContent content_;
};

class ErrorCodeTest : public testing::TestWithParam<Row>, protected ErrorsFixture {};

TEST_P(ErrorCodeTest, HasTheTextOfItsMessageKey) {
    addText(GetParam().messageKey);
    const KVError error = errors().kvUserErrorForCode(GetParam().code);
    EXPECT_EQ(error.domain(), "com.quillon.KelvoKit.KVRecordingErrorDomain");
    EXPECT_EQ(error.code(), GetParam().code);
    EXPECT_EQ(error.localizedDescription(), "<" + std::string(GetParam().messageKey) + ">");
    EXPECT_EQ(messageKeyForErrorCode(GetParam().code), GetParam().messageKey);
}

INSTANTIATE_TEST_SUITE_P(
    Table, ErrorCodeTest,
    testing::Values(Row{-5800, "RECORDING_ERROR_UNKNOWN"}, Row{-5801, "RECORDING_ERROR_USER_DECLINED"},
                    Row{-5802, "RECORDING_ERROR_DISABLED"}, Row{-5803, "RECORDING_ERROR_FAILED_TO_START"},
                    Row{-5804, "RECORDING_ERROR_FAILED"}, Row{-5805, "RECORDING_ERROR_INSUFFICIENT_STORAGE"},
                    Row{-5806, "RECORDING_ERROR_INTERRUPTED"}, Row{-5807, "RECORDING_ERROR_CONTENT_RESIZE"},
                    Row{-5808, "RECORDING_ERROR_INVALID_BROADCAST_SESSION"},
                    Row{-5809, "RECORDING_ERROR_SYSTEM_DORMANCY"}, Row{-5810, "RECORDING_ERROR_ENTITLEMENTS"},
                    Row{-5811, "RECORDING_ERROR_ACTIVE_PHONE_CALL"},
                    Row{-5812, "RECORDING_ERROR_FAILED_TO_SAVE"}, Row{-5813, "RECORDING_ERROR_AUTOBAY"},
                    Row{-5814, "RECORDING_ERROR_CONNECTION_INVALID"},
                    Row{-5815, "RECORDING_ERROR_CONNECTION_INTERRUPTED"},
                    Row{-5816, "RECORDING_ERROR_NO_CONTEXTID_MATCH"},
                    Row{-5817, "RECORDING_ERROR_MEDIASERVICES_FAILED"},
                    Row{-5818, "RECORDING_ERROR_MIXING_FAILURE"}, Row{-5819, "RECORDING_ERROR_UNKNOWN"}));

INSTANTIATE_TEST_SUITE_P(
    OutsideTheTable, ErrorCodeTest,
    testing::Values(Row{42, "RECORDING_ERROR_UNKNOWN"}, Row{0, "RECORDING_ERROR_UNKNOWN"},
                    Row{-1, "RECORDING_ERROR_UNKNOWN"}, Row{-5799, "RECORDING_ERROR_UNKNOWN"},
                    Row{-5820, "RECORDING_ERROR_UNKNOWN"},
                    Row{std::numeric_limits<std::int64_t>::min(), "RECORDING_ERROR_UNKNOWN"},
                    Row{std::numeric_limits<std::int64_t>::max(), "RECORDING_ERROR_UNKNOWN"}));

class KVUserErrorsTest : public testing::Test, protected ErrorsFixture {};

TEST_F(KVUserErrorsTest, NamedCodesHaveTheNumbersThatClientsCompare) {
    EXPECT_EQ(kRecordingErrorUnknown, -5800);
    EXPECT_EQ(kRecordingErrorUserDeclined, -5801);
    EXPECT_EQ(kRecordingErrorDisabled, -5802);
    EXPECT_EQ(kRecordingErrorFailedToStart, -5803);
    EXPECT_EQ(kRecordingErrorFailed, -5804);
    EXPECT_EQ(kRecordingErrorInsufficientStorage, -5805);
    EXPECT_EQ(kRecordingErrorInterrupted, -5806);
    EXPECT_EQ(kRecordingErrorContentResize, -5807);
    EXPECT_EQ(kRecordingErrorInvalidBroadcastSession, -5808);
    EXPECT_EQ(kRecordingErrorSystemDormancy, -5809);
    EXPECT_EQ(kRecordingErrorEntitlements, -5810);
    EXPECT_EQ(kRecordingErrorActivePhoneCall, -5811);
    EXPECT_EQ(kRecordingErrorFailedToSave, -5812);
    EXPECT_EQ(kRecordingErrorAutobay, -5813);
    EXPECT_EQ(kRecordingErrorConnectionInvalid, -5814);
    EXPECT_EQ(kRecordingErrorConnectionInterrupted, -5815);
    EXPECT_EQ(kRecordingErrorNoContextIDMatch, -5816);
    EXPECT_EQ(kRecordingErrorMediaServicesFailed, -5817);
    EXPECT_EQ(kRecordingErrorMixingFailure, -5818);
    EXPECT_EQ(kRecordingErrorBroadcastSetupRefused, -5819);
}

TEST_F(KVUserErrorsTest, WithoutUserInfoTheDescriptionStandsAlone) {
    addText("RECORDING_ERROR_DISABLED");
    EXPECT_EQ(errors().kvUserErrorForCode(-5802).userInfo(),
              (Dictionary{{kDescriptionKey, "<RECORDING_ERROR_DISABLED>"}}));
}

TEST_F(KVUserErrorsTest, GivenDescriptionIsReplacedAndOtherEntriesAreKept) {
    addText("RECORDING_ERROR_FAILED");
    const Dictionary given{{"before", 1}, {kDescriptionKey, "old"}, {"after", 2}};
    const KVError error = errors().kvUserErrorForCode(-5804, given);
    EXPECT_EQ(error.userInfo(),
              (Dictionary{{"before", 1}, {kDescriptionKey, "<RECORDING_ERROR_FAILED>"}, {"after", 2}}));
}

TEST_F(KVUserErrorsTest, GivenDictionaryIsNotChanged) {
    addText("RECORDING_ERROR_FAILED");
    const Dictionary given{{kDescriptionKey, "old"}};
    errors().kvUserErrorForCode(-5804, given);
    EXPECT_EQ(given, (Dictionary{{kDescriptionKey, "old"}}));
}

TEST_F(KVUserErrorsTest, WithoutATextTheGivenEntriesAreKeptAndNoDescriptionIsAdded) {
    EXPECT_EQ(errors().kvUserErrorForCode(-5804, Dictionary{{"k", 1}}).userInfo(), (Dictionary{{"k", 1}}));
    EXPECT_TRUE(errors().kvUserErrorForCode(-5804).userInfo().empty());
}

TEST_F(KVUserErrorsTest, WithoutATextAGivenDescriptionStays) {
    EXPECT_EQ(errors().kvUserErrorForCode(-5804, Dictionary{{kDescriptionKey, "old"}}).localizedDescription(),
              "old");
}

TEST_F(KVUserErrorsTest, ErrorOfARefusedBroadcastSetUpIsBuiltWithoutADescription) {
    addText("RECORDING_ERROR_UNKNOWN");
    const KVError direct(std::string(KVRecordingErrorDomain), kRecordingErrorBroadcastSetupRefused);
    EXPECT_TRUE(direct.userInfo().empty());
    EXPECT_EQ(direct.code(), errors().kvUserErrorForCode(-5819).code());
    EXPECT_NE(direct, errors().kvUserErrorForCode(-5819));
}

}  // namespace
}  // namespace kelvo
