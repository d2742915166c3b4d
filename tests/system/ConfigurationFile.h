// SPDX-License-Identifier: Apache-2.0
#ifndef TESTS_SYSTEM_CONFIGURATIONFILE_H
#define TESTS_SYSTEM_CONFIGURATIONFILE_H

#include "../TemporaryFolder.h"
#include "Node.h"

#include <gmock/gmock.h>
#include <string>
#include <tslauth/Configuration.h>
#include <tslauth/Exceptions.h>
#include <type_traits>

namespace tessel::authentication {

/// What every configuration class with a fixed path does. `File` names the class as `Class`, its
/// path as `path` and the key that the library uses as `key`.
template <typename File> class ConfigurationFileTest : public testing::Test {
protected:
    std::string const path = File::path;
    std::string const key = File::key;

    template <typename Error, typename Call> static std::string MessageOf(Call call) {
        try {
            call();
        } catch (Error const& error) {
            EXPECT_EQ(0UL, error.Code());
            return error.what();
        }
        ADD_FAILURE() << "nothing was thrown";
        return {};
    }
};

TYPED_TEST_SUITE_P(ConfigurationFileTest);

TYPED_TEST_P(ConfigurationFileTest, IsAConfigurationAndNothingMore) {
    using Class = typename TypeParam::Class;
    static_assert(std::is_base_of_v<Configuration, Class>);
    static_assert(std::is_default_constructible_v<Class>);
    static_assert(!std::is_constructible_v<Class, std::string>);
    static_assert(sizeof(Class) == sizeof(Configuration));
}

TYPED_TEST_P(ConfigurationFileTest, ReadsItsFileWhenItIsMade) {
    SetContents(this->path, this->key + " = \"first\"\n");
    typename TypeParam::Class const before;
    SetContents(this->path, this->key + " = \"second\"\n");
    EXPECT_EQ("first", before[this->key]);
    EXPECT_EQ("second", typename TypeParam::Class()[this->key]);
}

TYPED_TEST_P(ConfigurationFileTest, AnEmptyValueIsAValue) {
    SetContents(this->path, this->key + " = \"\"\n");
    EXPECT_EQ("", typename TypeParam::Class()[this->key]);
}

TYPED_TEST_P(ConfigurationFileTest, AMissingFileIsAnIOError) {
    std::filesystem::remove(this->path);
    EXPECT_EQ("Unable to open '" + this->path + "': No such file or directory",
              this->template MessageOf<IOError>([] { typename TypeParam::Class(); }));
    EXPECT_FALSE(std::filesystem::exists(this->path));
}

TYPED_TEST_P(ConfigurationFileTest, AMalformedFileIsAConfigurationErrorAndStays) {
    std::string const noDelimiter = this->key + " = \"x\"\n" + this->key + "\n";
    SetContents(this->path, noDelimiter);
    EXPECT_EQ("Error parsing configuration on line 2: no delimiter found",
              this->template MessageOf<ConfigurationError>([] { typename TypeParam::Class(); }));
    EXPECT_EQ(noDelimiter, Contents(this->path));
    std::string const badQuoting = this->key + " = \"\n";
    SetContents(this->path, badQuoting);
    EXPECT_EQ("Error parsing configuration at line 1: invalid quoting",
              this->template MessageOf<ConfigurationError>([] { typename TypeParam::Class(); }));
    EXPECT_EQ(badQuoting, Contents(this->path));
}

TYPED_TEST_P(ConfigurationFileTest, AMissingKeyIsNotCreated) {
    SetContents(this->path, "other = \"x\"\n");
    typename TypeParam::Class configuration;
    EXPECT_EQ(
        "The specified key '" + this->key + "' was not found in this configuration",
        this->template MessageOf<InvalidKeyException>([&] { configuration[this->key] = "x"; }));
    EXPECT_EQ(1U, configuration.size());
    EXPECT_EQ("other = \"x\"\n", Contents(this->path));
}

TYPED_TEST_P(ConfigurationFileTest, DestructionWritesNothing) {
    SetContents(this->path, this->key + "=x\n");
    typename TypeParam::Class()[this->key] = "y";
    EXPECT_EQ(this->key + "=x\n", Contents(this->path));
}

TYPED_TEST_P(ConfigurationFileTest, WriteKeepsOtherKeysAndSortsAndQuotesThem) {
    SetContents(this->path, "z=1\n" + this->key + " = None\nB = 'x y'\n");
    std::filesystem::permissions(this->path, std::filesystem::perms(0640));
    typename TypeParam::Class configuration;
    configuration[this->key] = "Active Directory";
    configuration.Write();
    EXPECT_EQ("B = \"x y\"\n" + this->key + " = \"Active Directory\"\nz = \"1\"\n",
              Contents(this->path));
    EXPECT_EQ(0640U, ModeOf(this->path));
}

TYPED_TEST_P(ConfigurationFileTest, AMinimalFileComesBackAsItWas) {
    SetContents(this->path, this->key + " = \"None\"\n");
    typename TypeParam::Class().Write();
    EXPECT_EQ(this->key + " = \"None\"\n", Contents(this->path));
}

TYPED_TEST_P(ConfigurationFileTest, AFailedWriteLeavesTheOldFile) {
    std::string const folder = "/etc/tessel/tslauth";
    SetContents(this->path, this->key + " = \"None\"\n");
    typename TypeParam::Class configuration;
    configuration[this->key] = "Active Directory";
    std::filesystem::rename(folder, folder + ".moved");
    EXPECT_EQ("Unable to create temporary file to write '" + this->path +
                  "': No such file or directory",
              this->template MessageOf<IOError>([&] { configuration.Write(); }));
    std::filesystem::rename(folder + ".moved", folder);
    EXPECT_EQ(this->key + " = \"None\"\n", Contents(this->path));
}

REGISTER_TYPED_TEST_SUITE_P(ConfigurationFileTest, IsAConfigurationAndNothingMore,
                            ReadsItsFileWhenItIsMade, AnEmptyValueIsAValue, AMissingFileIsAnIOError,
                            AMalformedFileIsAConfigurationErrorAndStays, AMissingKeyIsNotCreated,
                            DestructionWritesNothing, WriteKeepsOtherKeysAndSortsAndQuotesThem,
                            AMinimalFileComesBackAsItWas, AFailedWriteLeavesTheOldFile);

} // namespace tessel::authentication

#endif
