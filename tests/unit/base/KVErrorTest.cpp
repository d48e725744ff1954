#include "base/KVError.h"
#include "base/Result.h"

#include <cerrno>
#include <memory>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

const std::string kDescriptionKey(kLocalizedDescriptionKey);
const std::string kReasonKey(kLocalizedFailureReasonKey);

TEST(KVErrorTest, KeepsDomainCodeAndUserInfo) {
    const KVError error("domain", -5800, {{"key", "value"}});
    EXPECT_EQ(error.domain(), "domain");
    EXPECT_EQ(error.code(), -5800);
    EXPECT_EQ(error.userInfo(), (Dictionary{{"key", "value"}}));
}

TEST(KVErrorTest, LocalizedTextsComeFromTheUserInfo) {
    const KVError error("domain", 1, {{kDescriptionKey, "what"}, {kReasonKey, "why"}});
    EXPECT_EQ(error.localizedDescription(), "what");
    EXPECT_EQ(error.localizedFailureReason(), "why");
}

TEST(KVErrorTest, LocalizedTextsAreEmptyWithoutTheirKeys) {
    EXPECT_EQ(KVError("domain", 1).localizedDescription(), "");
    EXPECT_EQ(KVError("domain", 1).localizedFailureReason(), "");
}

TEST(KVErrorTest, LocalizedTextThatIsNoTextIsEmpty) {
    EXPECT_EQ(KVError("domain", 1, {{kDescriptionKey, 5}}).localizedDescription(), "");
}

TEST(KVErrorTest, DescriptionNamesDomainCodeAndText) {
    EXPECT_EQ(KVError("domain", -3).description(), "domain -3");
    EXPECT_EQ(KVError("domain", -3, {{kDescriptionKey, "what"}}).description(), "domain -3 (what)");
}

TEST(KVErrorTest, PosixErrorNamesItsSubject) {
    const KVError error = KVError::posix(ENOENT, "/a");
    EXPECT_EQ(error.domain(), "KVPOSIXErrorDomain");
    EXPECT_EQ(error.code(), ENOENT);
    EXPECT_EQ(error.localizedDescription(), "/a: No such file or directory");
}

TEST(KVErrorTest, PosixErrorWithoutASubjectHasTheTextAlone) {
    EXPECT_EQ(KVError::posix(ENOENT, "").localizedDescription(), "No such file or directory");
}

TEST(KVErrorTest, EqualityIsOfAllThreeParts) {
    const KVError error("d", 1, {{"k", 1}});
    EXPECT_EQ(error, KVError("d", 1, {{"k", 1}}));
    EXPECT_NE(error, KVError("e", 1, {{"k", 1}}));
    EXPECT_NE(error, KVError("d", 2, {{"k", 1}}));
    EXPECT_NE(error, KVError("d", 1));
}

TEST(ResultTest, ValueIsASuccess) {
    const Result<int> result(7);
    EXPECT_TRUE(result);
    EXPECT_EQ(*result, 7);
    EXPECT_EQ(result.optionalError(), std::nullopt);
    EXPECT_EQ(result.valueOr(1), 7);
}

TEST(ResultTest, ErrorIsAFailure) {
    const Result<int> result(KVError("d", 1));
    EXPECT_FALSE(result);
    EXPECT_EQ(result.error(), KVError("d", 1));
    EXPECT_EQ(result.optionalError(), OptionalError(KVError("d", 1)));
    EXPECT_EQ(result.valueOr(1), 1);
}

TEST(ResultTest, MembersOfTheValueAreReachable) {
    const Result<std::string> result(std::string("text"));
    EXPECT_EQ(result->size(), 4U);
}

TEST(ResultTest, ValueThatOnlyMovesCanBeTakenOut) {
    Result<std::unique_ptr<int>> result(std::make_unique<int>(3));
    const std::unique_ptr<int> taken = std::move(*result);
    EXPECT_EQ(*taken, 3);
}

}  // namespace
}  // namespace kelvo
