// SPDX-License-Identifier: Apache-2.0
#include <OneTimeCode.h>

#include "../../../providers/winbind-cam/Codes.h"
#include "../../../providers/winbind/Failure.h"
#include "../../TemporaryFolder.h"

#include <fcntl.h>
#include <fstream>
#include <gmock/gmock.h>
#include <sys/stat.h>
#include <unistd.h>

namespace tessel::winbind::cam {
namespace {

class OneTimeCodeTest : public testing::Test {
protected:
    void Write(std::string const& text, mode_t mode = 0600) {
        std::ofstream(_path) << text;
        ASSERT_EQ(0, chmod(_path.c_str(), mode));
    }

    std::string Text() const {
        SecretText const text = OneTimeCode(_path).Read();
        return std::string(View(text));
    }

    Codes::Code FailureCode() const {
        try {
            (void)OneTimeCode(_path).Read(); // what is looked at is how it fails
        } catch (Failure const& failure) {
            EXPECT_THAT(failure.what(), testing::HasSubstr(_path));
            EXPECT_THAT(failure.what(), testing::Not(testing::HasSubstr("ABCD")));
            return failure.Code();
        }
        return 0;
    }

    TemporaryFolder _folder;
    std::string _path = _folder / "code";
};

TEST_F(OneTimeCodeTest, TheWhiteSpaceAroundACodeIsNotPartOfIt) {
    Write(" \tABCD-1234\r\n\n");
    EXPECT_EQ("ABCD-1234", Text());
    Write("ABCD-1234");
    EXPECT_EQ("ABCD-1234", Text());
}

TEST_F(OneTimeCodeTest, AMissingOrEmptyFileIsNoCode) {
    EXPECT_EQ(Codes::NoCodeOnThisHost, FailureCode());
    Write("");
    EXPECT_EQ(Codes::NoCodeOnThisHost, FailureCode());
    Write(" \n");
    EXPECT_EQ(Codes::NoCodeOnThisHost, FailureCode());
}

TEST_F(OneTimeCodeTest, ACodeThatOthersMayHaveReadIsNotUsed) {
    for (mode_t const mode : {0640U, 0604U, 0620U, 0602U, 0601U}) {
        Write("ABCD", mode);
        EXPECT_EQ(Codes::CodeNotProtected, FailureCode()) << mode;
    }
    Write("ABCD", 0400);
    EXPECT_EQ("ABCD", Text());
}

TEST_F(OneTimeCodeTest, OnlyARegularFileIsRead) {
    ASSERT_EQ(0, mkfifo(_path.c_str(), 0600));
    EXPECT_EQ(Codes::CodeNotProtected, FailureCode());
    ASSERT_EQ(0, unlink(_path.c_str()));
    std::string const target = _folder / "target";
    std::ofstream(target) << "ABCD";
    ASSERT_EQ(0, chmod(target.c_str(), 0600));
    ASSERT_EQ(0, symlink(target.c_str(), _path.c_str()));
    EXPECT_EQ(Codes::CodeNotProtected, FailureCode());
}

TEST_F(OneTimeCodeTest, WhatCannotBeACodeIsNotSent) {
    for (std::string const& text :
         {std::string("ABCD\nABCD"), std::string("ABCD EFGH"), std::string("ABCD\0EFGH", 9),
          std::string(300, 'A'), std::string("ABCD\xc3\xb6"), std::string("{}")}) {
        Write(text);
        EXPECT_EQ(Codes::InvalidParameter, FailureCode()) << text;
    }
    Write(std::string(256, 'A'));
    EXPECT_EQ(std::string(256, 'A'), Text());
}

TEST_F(OneTimeCodeTest, ASpentCodeIsOverwrittenAndRemoved) {
    Write("ABCD-1234\n");
    std::string const other = _folder / "other";
    ASSERT_EQ(0, link(_path.c_str(), other.c_str()));
    OneTimeCode(_path).Spend();
    EXPECT_NE(0, access(_path.c_str(), F_OK));
    EXPECT_EQ(std::string(10, '\0'), Contents(other));
    OneTimeCode(_path).Spend(); // gone already
}

TEST_F(OneTimeCodeTest, ACodeThatCannotBeRemovedIsAFailure) {
    ASSERT_EQ(0, mkdir(_path.c_str(), 0700));
    EXPECT_THROW(OneTimeCode(_path).Spend(), Failure);
}

} // namespace
} // namespace tessel::winbind::cam
