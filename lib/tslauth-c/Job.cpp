// SPDX-License-Identifier: Apache-2.0
#include "Directory.h"

#include <base/Descriptor.h>
#include <base/SignalsBlocked.h>

#include <cerrno>
#include <condition_variable>
#include <cstring>
#include <functional>
#include <sys/eventfd.h>
#include <thread>

namespace tessel::tslauth_c {

namespace {

/// What a job and its thread share.
struct Shared {
    std::mutex lock; // guards what follows
    std::condition_variable ended;
    bool hasEnded = false;
    std::exception_ptr failure;
    tslauth_answer answer;
    base::Descriptor descriptor;
};

typedef std::function<tslauth_answer()> Work;

void End(Shared& shared, tslauth_answer answer, std::exception_ptr const& failure) {
    std::lock_guard<std::mutex> const guard(shared.lock);
    shared.answer = std::move(answer);
    shared.failure = failure;
    shared.hasEnded = true;
    shared.ended.notify_all();
    std::uint64_t const one = 1;
    // Cannot fail for a counter that is 0, and the descriptor is there as long as this object.
    (void)!write(shared.descriptor.Get(), &one, sizeof one);
}

void Run(std::shared_ptr<Shared> const& shared, Work& work) {
    tslauth_answer answer;
    std::exception_ptr failure;
    try {
        answer = work();
    } catch (...) {
        failure = std::current_exception();
    }
    work = nullptr; // with the secrets that it holds
    End(*shared, std::move(answer), failure);
}

std::shared_ptr<Shared> Start(Work work) {
    auto shared = std::make_shared<Shared>();
    shared->descriptor = base::Descriptor(eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK));
    if (!shared->descriptor) {
        throw Failure(TSLAUTH_ERROR_SYSTEM,
                      std::string("cannot make a descriptor: ") + std::strerror(errno));
    }
    base::SignalsBlocked const signals;
    std::thread([shared, work = std::move(work)]() mutable { Run(shared, work); }).detach();
    return shared;
}

} // namespace

} // namespace tessel::tslauth_c

struct tslauth_job {
    std::shared_ptr<tessel::tslauth_c::Shared> shared;
};

using namespace tessel::tslauth_c;

int tslauth_job_ask(tslauth_directory* directory, tslauth_question question, tslauth_job** job,
                    tslauth_error** error) {
    return Guarded(error, [&] {
        *job = new tslauth_job{
            Start([owner = directory->directory, question] { return owner->Ask(question); })};
    });
}

int tslauth_job_join(tslauth_directory* directory, char const* domain, char const* user,
                     char const* password, unsigned flags, tslauth_job** job,
                     tslauth_error** error) {
    return Guarded(error, [&] {
        auto const secret = std::make_shared<Secret>(password);
        auto const name = std::make_shared<Secret>(user);
        *job = new tslauth_job{Start([owner = directory->directory, secret, name, flags,
                                      where = RequiredText(domain, "the domain")] {
            owner->Join(where, name->Get(), secret->Get(), flags);
            return tslauth_answer();
        })};
    });
}

int tslauth_job_part(tslauth_directory* directory, char const* user, char const* password,
                     tslauth_job** job, tslauth_error** error) {
    return Guarded(error, [&] {
        auto const secret = std::make_shared<Secret>(password);
        auto const name = std::make_shared<Secret>(user);
        *job = new tslauth_job{Start([owner = directory->directory, secret, name] {
            owner->Part(name->Get(), secret->Get());
            return tslauth_answer();
        })};
    });
}

int tslauth_job_descriptor(tslauth_job const* job) {
    return job->shared->descriptor.Get();
}

int tslauth_job_finish(tslauth_job* job, tslauth_answer** answer, tslauth_error** error) {
    std::unique_ptr<tslauth_job> const owned(job);
    return Guarded(error, [&] {
        Shared& shared = *owned->shared;
        std::unique_lock<std::mutex> lock(shared.lock);
        while (!shared.hasEnded) {
            shared.ended.wait(lock);
        }
        if (shared.failure != nullptr) {
            std::rethrow_exception(shared.failure);
        }
        if (answer != nullptr) {
            *answer = new tslauth_answer(shared.answer);
        }
    });
}

void tslauth_job_abandon(tslauth_job* job) {
    delete job;
}
