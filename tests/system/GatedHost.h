// SPDX-License-Identifier: Apache-2.0
#ifndef TESTS_SYSTEM_GATEDHOST_H
#define TESTS_SYSTEM_GATEDHOST_H

#include "Host.h"
#include "LoadedProvider.h"
#include "SystemLog.h"
#include "providers/Gate.h"

#include <tslauth/ActiveDirectoryStore.h>

#include <chrono>
#include <deque>
#include <dirent.h>
#include <memory>
#include <string>
#include <thread>

TSLAUTH_AUTO_PTR_BEGIN

namespace Host {

/// A host whose provider answers while its gate is open, and hangs while it is closed.
class GatedTest : public Test {
protected:
    typedef tessel::authentication::ActiveDirectoryStore Store;
    typedef tessel::authentication::ActiveDirectoryStoreConfiguration Configuration;

    /// Whom a provider answers: no time at all, or all it takes.
    static constexpr int NoTime = 0;
    static constexpr int Time = 60;

    void SetUp() override {
        Test::SetUp();
        UseProvider("gate");
        _library = std::make_unique<LoadedProvider>("gate");
        _gate = &_library->Find<Gate>("gate");
        _impatient = std::make_unique<Store>(NoTime);
        _patient = std::make_unique<Store>(Time);
        Change([](Gate& it) {
            it.code = it.value = it.domainsOpen = 0;
            it.calls = it.mostInside = 0;
        });
    }

    void TearDown() override {
        Open();
        AwaitNobodyInside();
        AwaitEndOfWorkers();
        _library.reset();
        Test::TearDown();
    }

    static void UseProvider(std::string const& name) {
        Host::Write(Paths::ProviderConfiguration, "provider = \"" + name + "\"\n");
    }

    template <typename Edit> void Change(Edit edit) {
        pthread_mutex_lock(&_gate->lock);
        edit(*_gate);
        pthread_cond_broadcast(&_gate->change);
        pthread_mutex_unlock(&_gate->lock);
    }
    void Close() {
        Change([](Gate& it) { it.closed = 1; });
    }
    void Open() {
        Change([](Gate& it) { it.closed = 0; });
    }
    /// Waits until `condition` holds of the gate; ctest ends a test that waits for ever.
    template <typename Condition> void Await(Condition condition) {
        pthread_mutex_lock(&_gate->lock);
        while (!condition(*_gate)) {
            pthread_cond_wait(&_gate->change, &_gate->lock);
        }
        pthread_mutex_unlock(&_gate->lock);
    }
    void AwaitSomebodyInside() {
        Await([](Gate const& it) { return it.inside != 0; });
    }
    void AwaitNobodyInside() {
        Await([](Gate const& it) { return it.inside == 0; });
    }
    unsigned Calls() {
        unsigned calls = 0;
        Change([&](Gate& it) { calls = it.calls; });
        return calls;
    }

    /// The snapshot, as its own class.
    static Configuration ConfigurationOf(Store const& store) {
        std::auto_ptr<tessel::authentication::StoreConfiguration> const configuration =
            store.GetStoreConfiguration();
        return dynamic_cast<Configuration&>(*configuration);
    }

    /// Asks until the worker that was late has delivered.
    static std::deque<tessel::authentication::Domain> EventuallyTrustedDomains(Store const& store) {
        std::deque<tessel::authentication::Domain> domains;
        for (int i = 0; i < 500 && domains.empty(); ++i) {
            std::this_thread::sleep_for(std::chrono::milliseconds(10));
            domains = store.GetTrustedDomains();
        }
        return domains;
    }

    /// Waits until every worker is gone, and with them their hold on flags and stores.
    void AwaitEndOfWorkers() const {
        AwaitWorkers(0);
    }
    void AwaitWorkers(std::size_t count) const {
        for (int i = 0; i < 1000 && Threads() != _threads + count; ++i) {
            std::this_thread::sleep_for(std::chrono::milliseconds(10));
        }
        EXPECT_EQ(_threads + count, Threads());
    }

    SystemLog _log;
    std::unique_ptr<Store> _impatient;
    std::unique_ptr<Store> _patient;
    Gate* _gate = nullptr;

private:
    static std::size_t Threads() {
        DIR* const folder = opendir("/proc/self/task");
        std::size_t count = 0;
        while (readdir(folder) != nullptr) {
            ++count;
        }
        closedir(folder);
        return count;
    }

    std::unique_ptr<LoadedProvider> _library;
    std::size_t const _threads = Threads(); // with the log's reader
};

} // namespace Host

TSLAUTH_AUTO_PTR_END

#endif
