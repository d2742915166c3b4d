// SPDX-License-Identifier: Apache-2.0
#include <tslauth/Configuration.h>

#include "../TemporaryFolder.h"
#include "../Unprivileged.h"
#include "../faults/Faults.h"

#include <algorithm>
#include <gmock/gmock.h>
#include <iterator>
#include <memory>
#include <random>
#include <sys/stat.h>
#include <tslauth/Exceptions.h>
#include <type_traits>
#include <utility>

namespace tessel::authentication {
namespace {

using Map = std::map<std::string, std::string>;

template <typename Error, typename Call> std::string MessageOf(Call call) {
    try {
        call();
    } catch (Error const& error) {
        EXPECT_EQ(0UL, error.Code());
        return error.what();
    }
    ADD_FAILURE() << "nothing was thrown";
    return {};
}

class ConfigurationTest : public testing::Test {
protected:
    Configuration Read(std::string const& text) {
        SetContents(path, text);
        return Configuration(path);
    }

    /// Reads `text`, which must be refused, and proves that the file is as it was.
    std::string Refusal(std::string const& text) {
        SetContents(path, text);
        std::string message = MessageOf<ConfigurationError>([&] { Configuration{path}; });
        EXPECT_TRUE(Contents(path) == text);
        EXPECT_THAT(folder.Names(), testing::ElementsAre("test.conf"));
        return message;
    }

    TemporaryFolder folder;
    std::string path = folder / "test.conf";
};

TEST_F(ConfigurationTest, IsASortedMap) {
    static_assert(std::is_base_of_v<Map, Configuration>);
    static_assert(std::has_virtual_destructor_v<Configuration>);
    Map const& map = Read("b=2\na=1\nB=3\n");
    EXPECT_THAT(map, testing::ElementsAre(testing::Pair("B", "3"), testing::Pair("a", "1"),
                                          testing::Pair("b", "2")));
}

TEST_F(ConfigurationTest, AnEmptyFileGivesAnEmptyMapAndIsWrittenEmpty) {
    Configuration const configuration = Read("");
    EXPECT_TRUE(configuration.empty());
    configuration.Write();
    EXPECT_EQ("", Contents(path));
}

TEST_F(ConfigurationTest, BlankLinesGiveAnEmptyMapAndAreWrittenAsAnEmptyFile) {
    Configuration const configuration = Read("\n  \n\t\n \t ");
    EXPECT_TRUE(configuration.empty());
    configuration.Write();
    EXPECT_EQ("", Contents(path));
}

TEST_F(ConfigurationTest, TheFirstOfTwoAssignmentsOfAKeyCounts) {
    EXPECT_EQ("1", Read("k=1\nk=2\n")["k"]);
}

TEST_F(ConfigurationTest, TheFirstAssignmentCountsWhereverTheOthersStand) {
    EXPECT_THAT(Read("b=1\nb=2\nc=1\na=1\nb=3\na=2\nd=1\nc=2\n"),
                testing::ElementsAre(testing::Pair("a", "1"), testing::Pair("b", "1"),
                                     testing::Pair("c", "1"), testing::Pair("d", "1")));
}

TEST_F(ConfigurationTest, AKeyMayBeEmptyAndIsThenTheFirst) {
    EXPECT_THAT(Read("=1\na=2\n=3\n"),
                testing::ElementsAre(testing::Pair("", "1"), testing::Pair("a", "2")));
    EXPECT_THAT(Read("a=2\n=1\n=3\n"),
                testing::ElementsAre(testing::Pair("", "1"), testing::Pair("a", "2")));
}

TEST_F(ConfigurationTest, ANumberSignStartsNoComment) {
    EXPECT_EQ("Error parsing configuration on line 3: no delimiter found",
              Refusal("a=1\n\n# text\n"));
    EXPECT_EQ("2", Read("#a = 2\n")["#a"]);
}

TEST_F(ConfigurationTest, BlankLinesCountForLineNumbers) {
    EXPECT_EQ("Error parsing configuration at line 4: invalid quoting",
              Refusal("\n \t\na=1\nb='\n"));
    EXPECT_EQ("Error parsing configuration on line 1: no delimiter found", Refusal("x"));
}

TEST_F(ConfigurationTest, TheFirstBadLineIsTheOneReported) {
    EXPECT_EQ("Error parsing configuration on line 2: no delimiter found",
              Refusal("z=1\nbad\na='\n"));
}

TEST_F(ConfigurationTest, AMissingKeyIsNotCreated) {
    Configuration configuration = Read("a=1\n");
    EXPECT_EQ("The specified key 'b' was not found in this configuration",
              MessageOf<InvalidKeyException>([&] { configuration["b"] = "2"; }));
    EXPECT_EQ("The specified key 'b' was not found in this configuration",
              MessageOf<InvalidKeyException>([&] { (void)std::as_const(configuration)["b"]; }));
    EXPECT_THAT(configuration, testing::ElementsAre(testing::Pair("a", "1")));
}

TEST_F(ConfigurationTest, AnExistingKeyIsReadAndAssigned) {
    Configuration configuration = Read("a=1\n");
    configuration["a"] = "2";
    EXPECT_EQ("2", std::as_const(configuration)["a"]);
}

TEST_F(ConfigurationTest, WriteSortsAndQuotesEveryLine) {
    Read("b=2\na=1\n").Write();
    EXPECT_EQ("a = \"1\"\nb = \"2\"\n", Contents(path));
    EXPECT_THAT(folder.Names(), testing::ElementsAre("test.conf"));
}

TEST_F(ConfigurationTest, WriteKeepsTheModeOfTheFile) {
    Configuration const configuration = Read("a=1\n");
    for (mode_t const mode : {0644U, 0600U, 0400U, 06751U, 01640U}) {
        ASSERT_EQ(0, ::chmod(path.c_str(), mode));
        configuration.Write();
        EXPECT_EQ(mode, ModeOf(path));
    }
}

TEST_F(ConfigurationTest, AFolderIsEmptyToWhoOnlyReadsAndRefusedToWhoWritesBack) {
    EXPECT_TRUE(Configuration(folder.Path()).empty());
    EXPECT_EQ("Cannot read '" + folder.Path() + "': it is not a regular file",
              MessageOf<IOError>([&] { Configuration(folder.Path(), OnReadError::Throw); }));
}

TEST_F(ConfigurationTest, APipeIsRefusedAndNotWaitedFor) {
    ASSERT_EQ(0, ::mkfifo(path.c_str(), 0600));
    EXPECT_EQ("Cannot read '" + path + "': it is not a regular file",
              MessageOf<IOError>([&] { Configuration{path}; }));
}

TEST_F(ConfigurationTest, WriteCreatesAFileThatIsGone) {
    Configuration configuration = Read("a=1\n");
    configuration.emplace("key", "value");
    std::filesystem::remove(path);
    configuration.Write();
    EXPECT_EQ("a = \"1\"\nkey = \"value\"\n", Contents(path));
    EXPECT_EQ(0600U, ModeOf(path));
}

TEST_F(ConfigurationTest, WriteIntoAFolderThatIsGoneSaysWhatFailed) {
    std::filesystem::create_directory(folder / "sub");
    SetContents(folder / "sub/x.conf", "a=1\n");
    Configuration const configuration(folder / "sub/x.conf");
    std::filesystem::remove_all(folder / "sub");
    EXPECT_EQ("Unable to create temporary file to write '" + folder / "sub/x.conf" +
                  "': No such file or directory",
              MessageOf<IOError>([&] { configuration.Write(); }));
}

TEST_F(ConfigurationTest, DestructionWritesNothing) {
    Read("a=1\n")["a"] = "2";
    EXPECT_EQ("a=1\n", Contents(path));
}

TEST_F(ConfigurationTest, ACopyWritesToTheSameFile) {
    Configuration const original = Read("a=1\n");
    Configuration copy = original;
    copy["a"] = "2";
    copy.Write();
    EXPECT_EQ("a = \"2\"\n", Contents(path));
    EXPECT_EQ("1", original["a"]);
}

TEST_F(ConfigurationTest, AQuoteInsideAValueComesBack) {
    Configuration configuration = Read("a=1\n");
    configuration["a"] = "say \"yes\" or 'no'\\";
    configuration.Write();
    EXPECT_EQ("a = \"say \"yes\" or 'no'\\\"\n", Contents(path));
    EXPECT_EQ("say \"yes\" or 'no'\\", Configuration(path)["a"]);
}

TEST_F(ConfigurationTest, ALineFeedInAValueDoesNotComeBack) {
    Configuration configuration = Read("a=1\n");
    configuration["a"] = "1\nb = 2";
    configuration.Write();
    EXPECT_EQ("a = \"1\nb = 2\"\n", Contents(path));
    EXPECT_THAT(Configuration(path),
                testing::ElementsAre(testing::Pair("a", "\"1"), testing::Pair("b", "2\"")));
}

TEST_F(ConfigurationTest, TheLastLineNeedsNoLineFeed) {
    EXPECT_THAT(Read("a=1\nb=2"),
                testing::ElementsAre(testing::Pair("a", "1"), testing::Pair("b", "2")));
}

TEST_F(ConfigurationTest, AMissingFileIsAnIOError) {
    EXPECT_EQ("Unable to open '" + path + "': No such file or directory",
              MessageOf<IOError>([&] { Configuration{path}; }));
    EXPECT_THAT(folder.Names(), testing::IsEmpty());
}

TEST_F(ConfigurationTest, AnUnreadableFileIsAnIOErrorAndStays) {
    if (!faults::Available()) {
        GTEST_SKIP() << "this kernel has no seccomp notifications";
    }
    SetContents(path, "a=1\n");
    ASSERT_EQ(0, ::chmod(folder.Path().c_str(), 0755));
    ASSERT_EQ(0, ::chmod(path.c_str(), 0));
    faults::Outcome const outcome = faults::Run(
        [&] {
            BecomeUnprivileged();
            Configuration{path};
        },
        [](std::size_t, std::string const&) { return faults::Happens(); });
    EXPECT_EQ("tessel::authentication::IOError", outcome.exception);
    EXPECT_EQ("Unable to open '" + path + "': Permission denied", outcome.message);
    ASSERT_EQ(0, ::chmod(path.c_str(), 0600));
    EXPECT_EQ("a=1\n", Contents(path));
}

TEST_F(ConfigurationTest, AFolderReadsAsEmpty) {
    EXPECT_TRUE(Configuration(folder.Path()).empty());
}

TEST_F(ConfigurationTest, AHundredThousandLinesComeBack) {
    std::string text;
    for (int i = 0; i < 100000; ++i) {
        text += "key" + std::to_string(1000000 + i) + " = \"" + std::to_string(i) + "\"\n";
    }
    Configuration const configuration = Read(text);
    EXPECT_EQ(100000U, configuration.size());
    EXPECT_EQ("99999", configuration["key1099999"]);
    configuration.Write();
    EXPECT_TRUE(Contents(path) == text);
}

TEST_F(ConfigurationTest, TheLastOfAHundredThousandLinesIsCheckedToo) {
    std::string text;
    for (int i = 0; i < 99999; ++i) {
        text += "k=1\n";
    }
    EXPECT_EQ("Error parsing configuration on line 100000: no delimiter found",
              Refusal(text + "end"));
}

TEST_F(ConfigurationTest, ALineOfAMebibyteComesBack) {
    std::string const value(1024 * 1024, 'v');
    std::string const key(1024 * 1024, 'k');
    Configuration const configuration = Read("a=" + value + "\n" + key + "=1\n");
    EXPECT_TRUE(configuration["a"] == value);
    EXPECT_EQ("1", configuration[key]);
    configuration.Write();
    EXPECT_TRUE(Contents(path) == "a = \"" + value + "\"\n" + key + " = \"1\"\n");
    EXPECT_TRUE(Configuration(path) == configuration);
}

TEST_F(ConfigurationTest, AMebibyteWithoutADelimiterIsRefused) {
    EXPECT_EQ("Error parsing configuration on line 1: no delimiter found",
              Refusal(std::string(1024 * 1024, 'x')));
}

TEST_F(ConfigurationTest, BinaryBytesAreKept) {
    std::string all;
    for (int byte = 0; byte < 256; ++byte) {
        if (byte != '\n' && byte != '=') {
            all += static_cast<char>(byte);
        }
    }
    Configuration const configuration = Read(all + "=" + all + "\n");
    EXPECT_THAT(configuration, testing::ElementsAre(testing::Pair(all, all)));
    configuration.Write();
    EXPECT_TRUE(Contents(path) == all + " = \"" + all + "\"\n");
    EXPECT_TRUE(Configuration(path) == configuration);
}

TEST_F(ConfigurationTest, BinaryWithoutADelimiterIsRefused) {
    EXPECT_EQ("Error parsing configuration on line 2: no delimiter found",
              Refusal(std::string("\0=\0\n\x7f"
                                  "ELF\0\xff\n",
                                  11)));
}

TEST_F(ConfigurationTest, BytesAboveAsciiSortAfterIt) {
    EXPECT_THAT(Read("\xc3\xa4=1\nz=2\n\xff=3\na=4\n"),
                testing::ElementsAre(testing::Pair("a", "4"), testing::Pair("z", "2"),
                                     testing::Pair("\xc3\xa4", "1"), testing::Pair("\xff", "3")));
}

TEST_F(ConfigurationTest, CarriageReturnsStayInTheValues) {
    EXPECT_THAT(Read("a = \"b\"\r\nc=d\r\n"),
                testing::ElementsAre(testing::Pair("a", "\"b\"\r"), testing::Pair("c", "d\r")));
}

TEST_F(ConfigurationTest, ABlankLineWithACarriageReturnIsRefused) {
    EXPECT_EQ("Error parsing configuration on line 2: no delimiter found", Refusal("a=1\r\n\r\n"));
}

/// Keys whose order is decided late, early, by length or by a zero byte, against the plain
/// definition of the format: insert each, the first of a key wins.
TEST_F(ConfigurationTest, ReadingInAnyOrderGivesTheSameMap) {
    std::mt19937 random(20);
    std::vector<std::string> const stems = {
        "", "a", "key-", "key-0000", "long key.", std::string("key-\0", 5), "\xff\xff"};
    for (int round = 0; round < 200; ++round) {
        std::vector<std::pair<std::string, std::string>> lines;
        std::size_t const count = random() % 40;
        for (std::size_t i = 0; i < count; ++i) {
            std::string const stem = stems[random() % (round % 2 == 0 ? stems.size() : 3)];
            lines.emplace_back(stem + std::to_string(random() % 30), std::to_string(i));
        }
        if (round % 3 == 0) {
            std::sort(lines.begin(),
                      std::next(lines.begin(), static_cast<std::ptrdiff_t>(lines.size() / 2)));
        }
        Map expected;
        std::string text;
        for (auto const& [key, value] : lines) {
            expected.emplace(key, value);
            text += key + "=" + value + "\n";
        }
        EXPECT_EQ(expected, Map(Read(text))) << "round " << round;
    }
}

struct Line {
    char const* text;
    char const* key; ///< null if the line is refused
    char const* value;
};

class GetKeyValuePairTest : public testing::TestWithParam<Line> {};

TEST_P(GetKeyValuePairTest, SplitsAndCleans) {
    Line const& line = GetParam();
    if (line.key) {
        EXPECT_EQ(std::make_pair(std::string(line.key), std::string(line.value)),
                  GetKeyValuePair(line.text, 7));
    } else {
        EXPECT_EQ(line.value,
                  MessageOf<ConfigurationError>([&] { (void)GetKeyValuePair(line.text, 7); }));
    }
}

constexpr char badQuoting[] = "Error parsing configuration at line 7: invalid quoting";
constexpr char noDelimiter[] = "Error parsing configuration on line 7: no delimiter found";

INSTANTIATE_TEST_SUITE_P(
    Lines, GetKeyValuePairTest,
    testing::Values(Line{"key=value", "key", "value"},
                    Line{"  key\t=\t\"value\"  ", "key", "value"},
                    Line{"\"key\" = 'value'", "key", "value"}, Line{"key = \"\"", "key", ""},
                    Line{"key =", "key", ""}, Line{"key =   ", "key", "   "},
                    Line{"key = \"abc", "key", "\"abc"}, Line{"key = \"a'", "key", "\"a'"},
                    Line{"key = \"a \"b\" c\"", "key", "a \"b\" c"},
                    Line{"url = a=b=c", "url", "a=b=c"}, Line{"key = \"", nullptr, badQuoting},
                    Line{"' = x", nullptr, badQuoting}, Line{"a = \"b\"\r", "a", "\"b\"\r"},
                    // A field of nothing but blanks is the field.
                    Line{" = x", " ", "x"}, Line{"\t \t=\t", "\t \t", "\t"}, Line{"=", "", ""},
                    Line{"= =", "", "="},
                    // One character.
                    Line{"k = x ", "k", "x"}, Line{"k = ' ", nullptr, badQuoting},
                    Line{"\" = '", nullptr, badQuoting},
                    // Quotes: one pair, of one kind, at both ends.
                    Line{"k = ''", "k", ""}, Line{"k = '\"'", "k", "\""},
                    Line{"k = \"\"\"", "k", "\""}, Line{"k = \"'a'\"", "k", "'a'"},
                    Line{"k = 'a\"", "k", "'a\""}, Line{"k = a\"", "k", "a\""},
                    Line{"k = \"  a\t\"", "k", "  a\t"}, Line{"k = \\\"a\\\"", "k", "\\\"a\\\""},
                    Line{"k = \"a\" # b", "k", "\"a\" # b"}, Line{"'a b' = c d", "a b", "c d"},
                    Line{"\"a=b\" = c", "\"a", "b\" = c"}, Line{"#k = v", "#k", "v"},
                    // No delimiter.
                    Line{"key", nullptr, noDelimiter}, Line{"key: value", nullptr, noDelimiter},
                    Line{"\"", nullptr, noDelimiter}, Line{"", nullptr, noDelimiter}));

TEST(GetKeyValuePairMessageTest, HoldsTheNumberAsItIs) {
    EXPECT_EQ("Error parsing configuration on line 2147483647: no delimiter found",
              MessageOf<ConfigurationError>([] { (void)GetKeyValuePair("x", 2147483647); }));
    EXPECT_EQ("Error parsing configuration on line -1: no delimiter found",
              MessageOf<ConfigurationError>([] { (void)GetKeyValuePair("x", -1); }));
}

} // namespace
} // namespace tessel::authentication
