#include "base/UniqueFd.h"

#include <fcntl.h>
#include <utility>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

int openDescriptor() {
    return ::open("/dev/null", O_RDONLY | O_CLOEXEC);
}

bool isOpen(int descriptor) {
    return ::fcntl(descriptor, F_GETFD) >= 0;
}

TEST(UniqueFdTest, NewOneOwnsNothing) {
    const UniqueFd empty;
    EXPECT_FALSE(empty);
    EXPECT_EQ(empty.get(), -1);
}

TEST(UniqueFdTest, DescriptorZeroIsOwned) {
    UniqueFd zero(0);
    EXPECT_TRUE(zero);
    EXPECT_EQ(zero.release(), 0);
}

TEST(UniqueFdTest, ClosesItsDescriptorWhenItGoes) {
    const int descriptor = openDescriptor();
    { const UniqueFd owner(descriptor); }
    EXPECT_FALSE(isOpen(descriptor));
}

TEST(UniqueFdTest, ReleasedDescriptorStaysOpen) {
    int descriptor = -1;
    {
        UniqueFd owner(openDescriptor());
        descriptor = owner.release();
        EXPECT_FALSE(owner);
    }
    EXPECT_TRUE(isOpen(descriptor));
    ::close(descriptor);
}

TEST(UniqueFdTest, ResetClosesTheOldDescriptor) {
    const int first = openDescriptor();
    const int second = openDescriptor();
    UniqueFd owner(first);
    owner.reset(second);
    EXPECT_FALSE(isOpen(first));
    EXPECT_TRUE(isOpen(second));
    owner.reset();
    EXPECT_FALSE(isOpen(second));
}

TEST(UniqueFdTest, ResetToItsOwnDescriptorKeepsItOpen) {
    const int descriptor = openDescriptor();
    UniqueFd owner(descriptor);
    owner.reset(descriptor);
    EXPECT_TRUE(isOpen(descriptor));
}

TEST(UniqueFdTest, MoveHandsTheDescriptorOver) {
    const int descriptor = openDescriptor();
    UniqueFd first(descriptor);
    UniqueFd second(std::move(first));
    EXPECT_FALSE(first);  // NOLINT(bugprone-use-after-move): what a move leaves behind is the point
    EXPECT_EQ(second.get(), descriptor);
    EXPECT_TRUE(isOpen(descriptor));
}

TEST(UniqueFdTest, MoveAssignmentClosesWhatStoodThere) {
    const int replaced = openDescriptor();
    const int kept = openDescriptor();
    UniqueFd target(replaced);
    target = UniqueFd(kept);
    EXPECT_FALSE(isOpen(replaced));
    EXPECT_TRUE(isOpen(kept));
    UniqueFd& itself = target;
    target = std::move(itself);
    EXPECT_EQ(target.get(), kept);
    EXPECT_TRUE(isOpen(kept));
}

}  // namespace
}  // namespace kelvo
