// SPDX-License-Identifier: Apache-2.0
#include <tslauth/AuthenticationStoreFactory.h>
#include <tslauth/NoRemoteAuthenticationStore.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <stdexcept>

TSLAUTH_AUTO_PTR_BEGIN

using namespace tessel::authentication;
using testing::ElementsAre;

namespace {

std::auto_ptr<AuthenticationStore> Refuse() {
    throw std::logic_error("refused");
}

typedef std::auto_ptr<AuthenticationStore> StorePointer;

} // namespace

TEST(AuthenticationStoreFactory, RegistersTheBuiltInStores) {
    AuthenticationStoreFactory const factory;
    EXPECT_THAT(factory.GetRegisteredStores(), ElementsAre("Active Directory", "None"));
}

TEST(AuthenticationStoreFactory, CreatesTheNoneStoreByName) {
    AuthenticationStoreFactory factory;
    StorePointer const store = factory.CreateInstance("None");
    ASSERT_TRUE(store.get());
    EXPECT_TRUE(dynamic_cast<NoRemoteAuthenticationStore*>(store.get()));
    EXPECT_EQ("None", store->GetDisplayName());
}

TEST(AuthenticationStoreFactory, AnswersAnUnknownNameWithAnEmptyPointer) {
    AuthenticationStoreFactory factory;
    for (char const* name : {"none", "", "None ", "active directory", "Example Store"}) {
        EXPECT_FALSE(factory.CreateInstance(name).get()) << name;
    }
    EXPECT_FALSE(factory.CreateInstance(std::string("None\0", 5)).get());
}

TEST(AuthenticationStoreFactory, KeepsTheFirstRegistrationOfAName) {
    AuthenticationStoreFactory factory;
    factory.RegisterType("None", &Refuse);
    EXPECT_TRUE(dynamic_cast<NoRemoteAuthenticationStore*>(factory.CreateInstance("None").get()));
}

TEST(AuthenticationStoreFactory, ListsNamesInByteOrder) {
    AuthenticationStoreFactory factory;
    factory.RegisterType("Example Store", &Refuse);
    EXPECT_THAT(factory.GetRegisteredStores(),
                ElementsAre("Active Directory", "Example Store", "None"));
    factory.RegisterType("a", &Refuse);
    factory.RegisterType("", &Refuse);
    EXPECT_THAT(factory.GetRegisteredStores(),
                ElementsAre("", "Active Directory", "Example Store", "None", "a"));
}

TEST(AuthenticationStoreFactory, PassesAStoresFailureOn) {
    AuthenticationStoreFactory factory;
    factory.RegisterType("Example Store", &Refuse);
    EXPECT_THROW(factory.CreateInstance("Example Store"), std::logic_error);
}

TEST(AuthenticationStoreFactory, OutlivedByItsStores) {
    StorePointer store;
    {
        AuthenticationStoreFactory factory;
        store = factory.CreateInstance("None");
    }
    EXPECT_EQ("None", store->GetDisplayName());
}

TEST(Singleton, InstanceIsTheLivingObjectOrNull) {
    EXPECT_EQ(nullptr, AuthenticationStoreFactory::Instance());
    {
        AuthenticationStoreFactory factory;
        EXPECT_EQ(&factory, AuthenticationStoreFactory::Instance());
    }
    EXPECT_EQ(nullptr, AuthenticationStoreFactory::Instance());
    AuthenticationStoreFactory second;
    EXPECT_EQ(&second, AuthenticationStoreFactory::Instance());
}

TEST(SingletonDeathTest, SecondLivingObjectAborts) {
    AuthenticationStoreFactory factory;
    EXPECT_EXIT(AuthenticationStoreFactory(), testing::KilledBySignal(SIGABRT),
                testing::HasSubstr("lib/tslauth/include/Singleton:23: "
                                   "tessel::authentication::Singleton<T>::Singleton() [with T = "
                                   "tessel::authentication::AuthenticationStoreFactory]: "
                                   "Assertion `! _instance' failed."));
}

namespace {

/// Lets a test lose the instance, which no correct program can.
struct Losing : AuthenticationStoreFactory {
    static void Lose() {
        _instance = nullptr;
    }
};

void DestroyALostFactory() {
    AuthenticationStoreFactory factory;
    Losing::Lose();
}

} // namespace

TEST(SingletonDeathTest, DestroyingALostObjectAborts) {
    EXPECT_EXIT(DestroyALostFactory(), testing::KilledBySignal(SIGABRT),
                testing::HasSubstr("lib/tslauth/include/Singleton:29: "
                                   "tessel::authentication::Singleton<T>::~Singleton() [with T = "
                                   "tessel::authentication::AuthenticationStoreFactory]: "
                                   "Assertion `_instance' failed."));
}

namespace {

/// A singleton whose constructor can fail after its base has been made.
struct Fragile : Singleton<Fragile> {
    explicit Fragile(bool fail) {
        if (fail) {
            throw std::runtime_error("while constructing");
        }
    }
};

} // namespace

namespace tessel::authentication {
template <> Fragile* Singleton<Fragile>::_instance = nullptr;
} // namespace tessel::authentication

TEST(Singleton, FailedConstructionLeavesRoomForALaterAttempt) {
    EXPECT_THROW(Fragile(true), std::runtime_error);
    EXPECT_EQ(nullptr, Fragile::Instance());
    EXPECT_NO_THROW(Fragile(false));
}

TSLAUTH_AUTO_PTR_END
