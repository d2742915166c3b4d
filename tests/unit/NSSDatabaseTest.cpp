// SPDX-License-Identifier: Apache-2.0
#include <tslauth/systemconfiguration/NSSDatabase.h>

#include <gtest/gtest.h>

#include <string>

using namespace SystemConfiguration;

namespace {

template <typename Action> std::string Refusal(Action const& action) {
    try {
        action();
    } catch (InvalidDatabaseException const& error) {
        return error.what();
    }
    return "nothing was thrown";
}

struct Row {
    int number;
    NSSDatabase::Database value;
    char const* word;
};

class NSSDatabaseRow : public testing::TestWithParam<Row> {};

TEST_P(NSSDatabaseRow, ParsesToItsNumberAndPrintsBackUnchanged) {
    auto const& row = GetParam();
    NSSDatabase const database{std::string(row.word)};
    EXPECT_EQ(static_cast<int>(NSSDatabase::Database(database)), row.number);
    EXPECT_EQ(std::string(database), row.word);
    EXPECT_EQ(std::string(NSSDatabase(row.value)), row.word);

    NSSDatabase assigned;
    assigned = std::string(row.word);
    EXPECT_EQ(assigned, database);
    assigned = NSSDatabase::none;
    assigned = row.value;
    EXPECT_EQ(assigned, database);
}

TEST_P(NSSDatabaseRow, ComparesWithItsWordAndItsEnumeratorFromBothSides) {
    auto const& row = GetParam();
    NSSDatabase const database(row.value);
    EXPECT_TRUE(database == row.value);
    EXPECT_TRUE(row.value == database);
    EXPECT_TRUE(database == row.word);
    EXPECT_TRUE(row.word == database);
    EXPECT_FALSE(database != row.value);
    EXPECT_FALSE(row.value != database);
    EXPECT_FALSE(database != row.word);
    EXPECT_FALSE(row.word != database);

    auto const other = row.value == NSSDatabase::passwd ? NSSDatabase::group : NSSDatabase::passwd;
    EXPECT_TRUE(database != other);
    EXPECT_TRUE(database != NSSDatabase(other));
    EXPECT_FALSE(other == database);
}

INSTANTIATE_TEST_SUITE_P(
    All, NSSDatabaseRow,
    testing::Values(
        Row{1, NSSDatabase::passwd, "passwd"}, Row{2, NSSDatabase::group, "group"},
        Row{3, NSSDatabase::shadow, "shadow"}, Row{4, NSSDatabase::hosts, "hosts"},
        Row{5, NSSDatabase::netmasks, "netmasks"}, Row{6, NSSDatabase::networks, "networks"},
        Row{7, NSSDatabase::protocols, "protocols"}, Row{8, NSSDatabase::services, "services"},
        Row{9, NSSDatabase::ethers, "ethers"}, Row{10, NSSDatabase::rpc, "rpc"},
        Row{11, NSSDatabase::netgroup, "netgroup"}, Row{12, NSSDatabase::bootparams, "bootparams"},
        Row{13, NSSDatabase::publickey, "publickey"}, Row{14, NSSDatabase::automount, "automount"},
        Row{15, NSSDatabase::aliases, "aliases"}));

TEST(NSSDatabaseTest, DefaultDatabaseIsZeroAndHasNoWord) {
    NSSDatabase const database;
    EXPECT_EQ(database, NSSDatabase::none);
    EXPECT_EQ(static_cast<int>(NSSDatabase::Database(database)), 0);
    EXPECT_EQ(Refusal([&] { (void)std::string(database); }), "Invalid Database: ");
}

TEST(NSSDatabaseTest, WordsThatAreNoDatabaseAreRejected) {
    for (std::string const word :
         {"", "Passwd", "passwd:", "passw", "sudoers", "gshadow", "initgroups", " hosts"}) {
        EXPECT_EQ(Refusal([&] { NSSDatabase{word}; }), "Invalid Database: " + word);
    }
}

TEST(NSSDatabaseTest, ComparingWithAnUnknownWordThrows) {
    NSSDatabase const database(NSSDatabase::hosts);
    EXPECT_EQ(Refusal([&] { (void)(database == "bogus"); }), "Invalid Database: bogus");
    EXPECT_EQ(Refusal([&] { (void)("bogus" != database); }), "Invalid Database: bogus");
}

TEST(NSSDatabaseTest, ARefusedAssignmentLeavesTheDatabaseAsItWas) {
    NSSDatabase database(NSSDatabase::hosts);
    EXPECT_EQ(Refusal([&] { database = std::string("bogus"); }), "Invalid Database: bogus");
    EXPECT_EQ(database, NSSDatabase::hosts);
}

} // namespace
