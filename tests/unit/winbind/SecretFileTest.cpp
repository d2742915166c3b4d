// SPDX-License-Identifier: Apache-2.0
#include "host/SecretFile.h"

#include <gmock/gmock.h>
#include <string>
#include <unistd.h>

namespace tessel::winbind {
namespace {

std::string Read(int descriptor) {
    std::string text(64, '\0');
    ssize_t const count = ::pread(descriptor, text.data(), text.size(), 0);
    text.resize(count < 0 ? 0 : static_cast<std::size_t>(count));
    return text;
}

TEST(SecretFileTest, HoldsThePiecesOneBehindTheOther) {
    std::string const zero("\0", 1);
    SecretFile const file({"username = ", " a\"'#", zero, "", "\n"});
    EXPECT_EQ("username =  a\"'#" + zero + "\n", Read(file.Descriptor()));
}

TEST(SecretFileTest, IsEmptyForNothing) {
    SecretFile const file({});
    EXPECT_EQ("", Read(file.Descriptor()));
}

TEST(SecretFileTest, IsOverwrittenAtItsEnd) {
    int copy = -1;
    {
        SecretFile const file({"secret"});
        copy = ::dup(file.Descriptor());
    }
    EXPECT_EQ(std::string(6, '\0'), Read(copy));
    ::close(copy);
}

TEST(SecretFileTest, ClosesItsDescriptor) {
    int number = -1;
    {
        SecretFile const file({"secret"});
        number = file.Descriptor();
    }
    EXPECT_EQ(-1, ::lseek(number, 0, SEEK_CUR));
}

} // namespace
} // namespace tessel::winbind
