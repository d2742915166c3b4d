// SPDX-License-Identifier: Apache-2.0
#include "Recorder.h"

#include <chrono>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <new>
#include <sys/mman.h>

namespace tessel::providercheck {

Recorder& Recorder::Make() {
    void* const memory =
        mmap(nullptr, sizeof(Recorder), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    if (memory == MAP_FAILED) {
        std::perror("tslauth-provider-check: mmap");
        std::exit(2);
    }
    return *new (memory) Recorder;
}

void Recorder::Destroy(Recorder& recorder) {
    recorder.~Recorder();
    (void)munmap(&recorder, sizeof(Recorder)); // cannot fail for what was mapped
}

void Recorder::Found(Rule rule, char const* format, ...) {
    unsigned const index = _count++;
    if (index >= _findings.size()) {
        return; // enough to work on
    }
    Finding& finding = _findings[index];
    finding.rule = rule;
    va_list arguments;
    va_start(arguments, format);
    // NOLINTNEXTLINE(clang-analyzer-valist.Uninitialized): it is not
    (void)std::vsnprintf(finding.text.data(), finding.text.size(), format, arguments);
    va_end(arguments);
    finding.whole = true;
}

void Recorder::Begin(char const* format, ...) {
    va_list arguments;
    va_start(arguments, format);
    // NOLINTNEXTLINE(clang-analyzer-valist.Uninitialized): it is not
    (void)std::vsnprintf(_doing.data(), _doing.size(), format, arguments);
    va_end(arguments);
    ++_calls;
    _began = std::chrono::steady_clock::now().time_since_epoch() / std::chrono::nanoseconds(1);
}

void Recorder::AddTo(Report& report) const {
    for (std::size_t i = 0; i < RuleCount; ++i) {
        if (_examined[i] != 0) {
            report.Examined(static_cast<Rule>(i), _examined[i]);
        }
    }
    for (Finding const& finding : _findings) {
        if (finding.whole) {
            report.Found(finding.rule, finding.text.data());
        }
    }
}

} // namespace tessel::providercheck
