// SPDX-License-Identifier: Apache-2.0
#include <tslauth/ActiveDirectoryStore.h>

#include "MutexLock.h"
#include "WorkerFailure.h"

#include <tslauth/Exceptions.h>
#include <tslauth/ProviderConfiguration.h>
#include <tslauth/TslauthThreadUtil.h>

#include <boost/bind/bind.hpp>
#include <boost/make_shared.hpp>

#include <syslog.h>
#include <utility>

TSLAUTH_AUTO_PTR_BEGIN

namespace tessel::authentication {

namespace {

/// The trust state of a host whose provider finds nothing to read the trusted domains from.
constexpr int TrustStateFileNotFound = 7;

/// The provider's answer, or `neutral` where it does not offer the call.
template <typename Answer, typename Call> Answer AnswerOr(Answer neutral, Call call) {
    try {
        return call();
    } catch (CallNotImplementedException const&) {
        return neutral;
    }
}

/// One of the questions that a worker asks. It runs at most once at a time in the process: `active`
/// says that it runs, and is cleared by the worker when it ends, so that a provider that hangs
/// keeps every further caller on the cache and never gathers threads.
template <typename Answer> struct TimedQuestion {
    bool& active;
    bool& clearedWhenNotScheduled;
    void (*worker)(boost::shared_ptr<ActiveDirectoryProvider>, boost::shared_ptr<RequestState>,
                   boost::shared_ptr<Answer>);
    char const* timeoutWarning;
};

/// Whether the caller is the one to start the worker.
bool Claim(pthread_mutex_t& mutex, bool& active) {
    MutexLock const lock(mutex);
    return !std::exchange(active, true);
}

void Clear(pthread_mutex_t& mutex, bool& active) {
    MutexLock const lock(mutex);
    active = false;
}

template <typename Answer>
Answer AskTimed(TimedQuestion<Answer> const& question, pthread_mutex_t& mutex, int timeout,
                boost::shared_ptr<ActiveDirectoryProvider> const& provider,
                boost::shared_ptr<Answer> const& cache) {
    if (Claim(mutex, question.active)) {
        boost::shared_ptr<RequestState> state;
        try {
            state = boost::make_shared<RequestState>();
            TslauthThreadUtil::ScheduleThread(boost::bind(question.worker, provider, state, cache));
        } catch (ThreadErrorException const&) {
            Clear(mutex, question.clearedWhenNotScheduled);
            throw;
        } catch (...) {
            Clear(mutex, question.active);
            throw;
        }
        try {
            state->WaitResult(timeout);
        } catch (ProviderCallTimedOutException const&) {
            syslog(LOG_WARNING, "%s", question.timeoutWarning);
        }
    }
    MutexLock const lock(mutex);
    return *cache;
}

/// The work of a worker: asks, stores the answer in `cache`, clears `active` and reports the end.
/// A failure leaves the cache as it was. One of the library's own family reaches the waiter as it
/// is; any other would end the host's process if it left the thread, and becomes an internal error.
/// Answers are swapped in, so that nothing can fail under the lock.
template <typename Answer, typename Ask>
void AnswerInWorker(pthread_mutex_t& mutex, bool& active, RequestState& state, Answer& cache,
                    Ask ask) {
    try {
        Answer answer = AnswerOr(Answer(), ask);
        {
            MutexLock const lock(mutex);
            std::swap(cache, answer);
            active = false;
        }
        state.Done(nullptr);
    } catch (Exception const& failure) {
        Clear(mutex, active);
        state.Done(&failure);
    } catch (...) {
        Clear(mutex, active);
        state.Done(&WorkerFailure);
    }
}

/// Sets `field` to the provider's answer, or leaves it empty.
template <typename Field, typename Ask> void Fill(Field& field, Ask ask) {
    try {
        field = ask();
    } catch (...) {
        // One field that cannot be told must not hide the others.
    }
}

/// Unlike std::swap, which would copy this class, it cannot run out of memory.
void Swap(ActiveDirectoryStoreConfiguration& left,
          ActiveDirectoryStoreConfiguration& right) noexcept {
    std::swap(left.activeDomain, right.activeDomain);
    left.preferredDomainControllers.swap(right.preferredDomainControllers);
    left.machineAccountDN.swap(right.machineAccountDN);
}

} // namespace

pthread_mutex_t ActiveDirectoryStore::_lock = PTHREAD_MUTEX_INITIALIZER;
bool ActiveDirectoryStore::_isGetStoreConfigThreadActive = false;
bool ActiveDirectoryStore::_isGetTrustedDomainsThreadActive = false;
bool ActiveDirectoryStore::_isGetTrustStateThreadActive = false;

/// A fork copies neither the workers nor a thread that holds the lock, but the flags and the lock.
/// Without these a child would wait for answers that nobody is asking for.
struct ForkHandlers {
    static void BeforeFork() {
        pthread_mutex_lock(&ActiveDirectoryStore::_lock);
    }
    static void InParent() {
        pthread_mutex_unlock(&ActiveDirectoryStore::_lock);
    }
    static void InChild() {
        ActiveDirectoryStore::_isGetStoreConfigThreadActive = false;
        ActiveDirectoryStore::_isGetTrustedDomainsThreadActive = false;
        ActiveDirectoryStore::_isGetTrustStateThreadActive = false;
        pthread_mutex_unlock(&ActiveDirectoryStore::_lock);
    }
};

namespace {

/// When the library is loaded. It fails only where there is no memory, and then the host goes on
/// with what a fork gives it.
[[maybe_unused]] int const forkHandlersRegistered =
    pthread_atfork(&ForkHandlers::BeforeFork, &ForkHandlers::InParent, &ForkHandlers::InChild);

} // namespace

ActiveDirectoryStoreConfiguration::~ActiveDirectoryStoreConfiguration() = default;

ActiveDirectoryStore::ActiveDirectoryStore(int timeout)
    : _timeout(timeout),
      _provider(boost::make_shared<ActiveDirectoryProvider>(ConfiguredProvider())),
      _storeConfiguration(boost::make_shared<ActiveDirectoryStoreConfiguration>()),
      _trustState(boost::make_shared<TrustState>()),
      _trustedDomains(boost::make_shared<std::deque<Domain>>()) {}

ActiveDirectoryStore::~ActiveDirectoryStore() = default;

std::string ActiveDirectoryStore::GetDisplayName() const {
    return "Active Directory";
}

SystemConfiguration::PAMEntry ActiveDirectoryStore::GetPAMEntryForProvider() const {
    return GetProviderEntries().pam;
}

void ActiveDirectoryStore::MakeActive() {
    GetActivationPlan().Execute();
}

void ActiveDirectoryStore::MakeInactive() {
    GetWithdrawalPlan().Execute();
}

ActivationPlan ActiveDirectoryStore::GetActivationPlan(EditForm form) const {
    return ActivationPlan::Activating(GetProviderEntries(), GetDisplayName(), form);
}

ActivationPlan ActiveDirectoryStore::GetWithdrawalPlan(EditForm form) const {
    return ActivationPlan::Withdrawing(GetProviderEntries(), form);
}

ProviderEntries ActiveDirectoryStore::GetProviderEntries() const {
    return MakeProviderEntries(*_provider);
}

std::auto_ptr<StoreConfiguration> ActiveDirectoryStore::GetStoreConfiguration() const {
    TimedQuestion<ActiveDirectoryStoreConfiguration> const question = {
        _isGetStoreConfigThreadActive, _isGetStoreConfigThreadActive,
        &ActiveDirectoryStore::GetStoreConfigurationInt,
        "GetStoreConfiguration call timedout. Returning cached value."};
    return std::auto_ptr<StoreConfiguration>(new ActiveDirectoryStoreConfiguration(
        AskTimed(question, _lock, _timeout, _provider, _storeConfiguration)));
}

std::deque<Domain> ActiveDirectoryStore::GetTrustedDomains() const {
    // When its thread cannot be scheduled, the trust-state flag is cleared and this question's own
    // stays set. Deliberate: a host that ran out of threads once asks no more for its trusted
    // domains, and keeps what it knows until the process ends.
    TimedQuestion<std::deque<Domain>> const question = {
        _isGetTrustedDomainsThreadActive, _isGetTrustStateThreadActive,
        &ActiveDirectoryStore::GetTrustedDomainsInt,
        "GetTrustedDomains call timedout. Returning cached value."};
    return AskTimed(question, _lock, _timeout, _provider, _trustedDomains);
}

int ActiveDirectoryStore::GetDomainTrustState() const {
    try {
        GetTrustedDomains();
    } catch (FileNotFoundException const&) {
        MutexLock const lock(_lock);
        _trustState->value = TrustStateFileNotFound;
        return TrustStateFileNotFound;
    } catch (Exception const& failure) {
        syslog(LOG_WARNING, "GetDomainTrustState: Call to GetTrustedDomains() failed: %s",
               failure.what());
    }
    TimedQuestion<TrustState> const question = {
        _isGetTrustStateThreadActive, _isGetTrustStateThreadActive,
        &ActiveDirectoryStore::GetDomainTrustStateInt,
        "GetDomainTrustState call timedout. Returning cached value."};
    return AskTimed(question, _lock, _timeout, _provider, _trustState).value;
}

int ActiveDirectoryStore::GetDomainTrustRelationship(std::string const& domain) const {
    return AnswerOr(0, [&] { return _provider->GetDomainTrustRelationship(domain); });
}

std::string ActiveDirectoryStore::GetHostPrincipalForDomain(std::string const& domain) const {
    return AnswerOr(std::string(), [&] { return _provider->GetHostPrincipalForDomain(domain); });
}

std::string ActiveDirectoryStore::GetDomainControllerForDomain(std::string const& domain) const {
    return AnswerOr(std::string(),
                    [&] { return _provider->GetAnyDomainController(std::string(), domain); });
}

std::string ActiveDirectoryStore::ConvertCanonicalUsername(std::string const& name) const {
    return AnswerOr(name, [&] { return _provider->ConvertCanonicalUsername(name); });
}

void ActiveDirectoryStore::SetPreferredDomainControllers(
    std::deque<std::string> const& controllers) {
    try {
        _provider->SetPreferredDomainControllers(controllers);
    } catch (CallNotImplementedException const&) {
        syslog(LOG_WARNING, "Setting of preferred domain controllers is not implemented.");
    }
}

std::string ActiveDirectoryStore::GetLastFailure() const {
    return _provider->GetLastFailure();
}

std::string ActiveDirectoryStore::PreviewJoin(std::string const& domain,
                                              std::string const& organisationalUnit,
                                              Credentials const* credentials) const {
    return _provider->PreviewJoin(domain, organisationalUnit, credentials);
}

void ActiveDirectoryStore::GetStoreConfigurationInt(
    ProviderPointer provider, StatePointer state,
    boost::shared_ptr<ActiveDirectoryStoreConfiguration> cache) {
    try {
        ActiveDirectoryStoreConfiguration answer;
        Fill(answer.activeDomain, [&] { return provider->GetActiveDomain(); });
        Fill(answer.preferredDomainControllers,
             [&] { return provider->GetPreferredDomainControllers(); });
        Fill(answer.machineAccountDN, [&] { return provider->GetMachineAccountDN(); });
        {
            MutexLock const lock(_lock);
            Swap(*cache, answer);
            _isGetStoreConfigThreadActive = false;
        }
        state->Done(nullptr);
    } catch (...) {
        // Not even an empty answer could be made.
        Clear(_lock, _isGetStoreConfigThreadActive);
        state->Done(&WorkerFailure);
    }
}

void ActiveDirectoryStore::GetTrustedDomainsInt(ProviderPointer provider, StatePointer state,
                                                boost::shared_ptr<std::deque<Domain>> cache) {
    AnswerInWorker(_lock, _isGetTrustedDomainsThreadActive, *state, *cache,
                   [&] { return provider->GetTrustedDomains(); });
}

void ActiveDirectoryStore::GetDomainTrustStateInt(ProviderPointer provider, StatePointer state,
                                                  boost::shared_ptr<TrustState> cache) {
    AnswerInWorker(_lock, _isGetTrustStateThreadActive, *state, *cache,
                   [&] { return TrustState{provider->GetDomainTrustState()}; });
}

} // namespace tessel::authentication

TSLAUTH_AUTO_PTR_END
