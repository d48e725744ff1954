#pragma once

#include "platform/FileSystem.h"

#include <algorithm>
#include <cerrno>
#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo::test {

/// What every file system does. `World` supplies one in which "/private/store" can be made:
///
///     struct World {
///         FileSystem& fileSystem();
///         void addFile(const std::string& path, std::uint64_t size);   // its directory exists
///     };
template <typename World>
class FileSystemContract : public testing::Test {
  protected:
    FileSystemContract() { EXPECT_EQ(files.createDirectory(kStore), std::nullopt); }

    void addFile(const std::string& name, std::uint64_t size = 1) { world.addFile(inStore(name), size); }
    static std::string inStore(const std::string& name) { return kStore + "/" + name; }
    std::vector<std::string> names(const std::string& directory = kStore) {
        return files.namesInDirectory(directory).valueOr({"unreadable"});
    }
    static std::int64_t codeOf(const OptionalError& error) { return error ? error->code() : 0; }

    inline static const std::string kStore = "/private/store";
    World world;
    FileSystem& files = world.fileSystem();
};

TYPED_TEST_SUITE_P(FileSystemContract);

TYPED_TEST_P(FileSystemContract, CreatesDirectoriesWithThoseAboveThem) {
    const std::string path = this->inStore("a/b/c");
    EXPECT_FALSE(this->files.itemExists(path));
    EXPECT_EQ(this->files.createDirectory(path), std::nullopt);
    EXPECT_TRUE(this->files.itemExists(path));
    EXPECT_TRUE(this->files.itemExists(this->inStore("a")));
}

TYPED_TEST_P(FileSystemContract, CreatesWithATrailingSlashToo) {
    EXPECT_EQ(this->files.createDirectory(this->inStore("a/")), std::nullopt);
    EXPECT_TRUE(this->files.itemExists(this->inStore("a")));
    EXPECT_TRUE(this->files.itemExists(this->inStore("a/")));
}

TYPED_TEST_P(FileSystemContract, DirectoryThatExistsIsNoError) {
    this->addFile("kept");
    EXPECT_EQ(this->files.createDirectory(this->kStore), std::nullopt);
    EXPECT_EQ(this->names(), std::vector<std::string>{"kept"});
}

TYPED_TEST_P(FileSystemContract, DirectoryInPlaceOfAFileIsAnError) {
    this->addFile("file");
    EXPECT_NE(this->files.createDirectory(this->inStore("file")), std::nullopt);
    const OptionalError below = this->files.createDirectory(this->inStore("file/below"));
    ASSERT_TRUE(below);
    EXPECT_EQ(below->domain(), kPOSIXErrorDomain);
}

TYPED_TEST_P(FileSystemContract, DoubledSlashesCountAsOne) {
    this->addFile("a");
    EXPECT_TRUE(this->files.itemExists(this->kStore + "//a"));
    EXPECT_EQ(this->files.removeItem(this->kStore + "///a"), std::nullopt);
    EXPECT_TRUE(this->names().empty());
}

TYPED_TEST_P(FileSystemContract, NamesAreInAlphabeticalOrderAndOfOneLevel) {
    for (const char* name : {"b", "a", "B", "a-b", ".hidden"})
        this->addFile(name);
    ASSERT_EQ(this->files.createDirectory(this->inStore("c/below")), std::nullopt);
    EXPECT_EQ(this->names(), (std::vector<std::string>{".hidden", "B", "a", "a-b", "b", "c"}));
}

TYPED_TEST_P(FileSystemContract, EmptyDirectoryHasNoNames) {
    EXPECT_TRUE(this->names().empty());
}

TYPED_TEST_P(FileSystemContract, NamesOfWhatIsNoDirectoryAreAnError) {
    this->addFile("file");
    EXPECT_EQ(this->codeOf(this->files.namesInDirectory(this->inStore("none")).optionalError()), ENOENT);
    EXPECT_EQ(this->codeOf(this->files.namesInDirectory(this->inStore("file")).optionalError()), ENOTDIR);
}

TYPED_TEST_P(FileSystemContract, AttributesTellSizeKindAndDates) {
    this->addFile("file", 12345);
    const auto file = this->files.attributesOfItem(this->inStore("file"));
    ASSERT_TRUE(file);
    EXPECT_EQ(file->size, 12345U);
    EXPECT_FALSE(file->isDirectory);
    EXPECT_GT(file->modificationDate, Date::fromSecondsSince1970(1600000000));
    EXPECT_GT(file->creationDate, Date::fromSecondsSince1970(1600000000));
    const auto directory = this->files.attributesOfItem(this->kStore);
    ASSERT_TRUE(directory);
    EXPECT_TRUE(directory->isDirectory);
}

TYPED_TEST_P(FileSystemContract, AttributesOfAMissingItemAreAnError) {
    EXPECT_EQ(this->codeOf(this->files.attributesOfItem(this->inStore("none")).optionalError()), ENOENT);
}

TYPED_TEST_P(FileSystemContract, RemovesDirectoriesWithWhatTheyHold) {
    ASSERT_EQ(this->files.createDirectory(this->inStore("a/b")), std::nullopt);
    this->addFile("a/b/file");
    this->addFile("a-neighbour");
    EXPECT_EQ(this->files.removeItem(this->inStore("a")), std::nullopt);
    EXPECT_EQ(this->names(), std::vector<std::string>{"a-neighbour"});
    EXPECT_FALSE(this->files.itemExists(this->inStore("a/b/file")));
}

TYPED_TEST_P(FileSystemContract, RemovalOfAMissingItemIsAnError) {
    EXPECT_EQ(this->codeOf(this->files.removeItem(this->inStore("none"))), ENOENT);
}

TYPED_TEST_P(FileSystemContract, MovesFiles) {
    this->addFile("from", 7);
    EXPECT_EQ(this->files.moveItem(this->inStore("from"), this->inStore("to")), std::nullopt);
    EXPECT_EQ(this->names(), std::vector<std::string>{"to"});
    EXPECT_EQ(this->files.attributesOfItem(this->inStore("to"))->size, 7U);
}

TYPED_TEST_P(FileSystemContract, MovesDirectoriesWithWhatTheyHold) {
    ASSERT_EQ(this->files.createDirectory(this->inStore("from/inner")), std::nullopt);
    this->addFile("from/inner/file", 7);
    EXPECT_EQ(this->files.moveItem(this->inStore("from"), this->inStore("to")), std::nullopt);
    EXPECT_TRUE(this->files.itemExists(this->inStore("to/inner/file")));
    EXPECT_FALSE(this->files.itemExists(this->inStore("from")));
}

TYPED_TEST_P(FileSystemContract, MoveReplacesNothing) {
    this->addFile("from", 7);
    this->addFile("to", 9);
    EXPECT_EQ(this->codeOf(this->files.moveItem(this->inStore("from"), this->inStore("to"))), EEXIST);
    EXPECT_EQ(this->files.attributesOfItem(this->inStore("to"))->size, 9U);
    EXPECT_TRUE(this->files.itemExists(this->inStore("from")));
}

TYPED_TEST_P(FileSystemContract, MoveOfAMissingItemOrIntoAMissingDirectoryIsAnError) {
    this->addFile("from");
    EXPECT_EQ(this->codeOf(this->files.moveItem(this->inStore("none"), this->inStore("to"))), ENOENT);
    EXPECT_EQ(this->codeOf(this->files.moveItem(this->inStore("from"), this->inStore("none/to"))), ENOENT);
    EXPECT_TRUE(this->files.itemExists(this->inStore("from")));
}

TYPED_TEST_P(FileSystemContract, MoveIntoItselfIsAnError) {
    ASSERT_EQ(this->files.createDirectory(this->inStore("a")), std::nullopt);
    EXPECT_EQ(this->codeOf(this->files.moveItem(this->inStore("a"), this->inStore("a/b"))), EINVAL);
    EXPECT_EQ(this->names(), std::vector<std::string>{"a"});
}

TYPED_TEST_P(FileSystemContract, FreeSpaceIsThatOfTheVolume) {
    const auto free = this->files.freeSpace(this->kStore);
    ASSERT_TRUE(free);
    EXPECT_GT(*free, 0U);
}

REGISTER_TYPED_TEST_SUITE_P(FileSystemContract, CreatesDirectoriesWithThoseAboveThem,
                            CreatesWithATrailingSlashToo, DirectoryThatExistsIsNoError,
                            DirectoryInPlaceOfAFileIsAnError, DoubledSlashesCountAsOne,
                            NamesAreInAlphabeticalOrderAndOfOneLevel, EmptyDirectoryHasNoNames,
                            NamesOfWhatIsNoDirectoryAreAnError, AttributesTellSizeKindAndDates,
                            AttributesOfAMissingItemAreAnError, RemovesDirectoriesWithWhatTheyHold,
                            RemovalOfAMissingItemIsAnError, MovesFiles, MovesDirectoriesWithWhatTheyHold,
                            MoveReplacesNothing, MoveOfAMissingItemOrIntoAMissingDirectoryIsAnError,
                            MoveIntoItselfIsAnError, FreeSpaceIsThatOfTheVolume);

}  // namespace kelvo::test
