// SPDX-License-Identifier: Apache-2.0
#include <tslauth/ActivationPlan.h>

#include "ConfigurationText.h"
#include "ProviderModules.h"
#include "SystemFile.h"
#include "lossless/LosslessNSSConfiguration.h"
#include "lossless/LosslessPAMPolicy.h"
#include <tslauth/Paths.h>

#include <tslauth/ActiveDirectoryProvider.h>
#include <tslauth/ActiveDirectoryStore.h>
#include <tslauth/AuthenticationConfiguration.h>
#include <tslauth/AuthenticationStoreFactory.h>
#include <tslauth/Exceptions.h>

#include <base/AsciiText.h>
#include <base/WholeFile.h>
#include <boost/make_shared.hpp>
#include <meaning/Losses.h>

#include <algorithm>
#include <iterator>
#include <map>
#include <optional>
#include <stdexcept>
#include <utility>

TSLAUTH_AUTO_PTR_BEGIN

namespace tessel::authentication {

/// One thing that a plan does.
class ActivationStep {
public:
    ActivationStep() = default;
    ActivationStep(ActivationStep const&) = delete;
    ActivationStep& operator=(ActivationStep const&) = delete;
    virtual ~ActivationStep() = default;

    /// The one file that it writes; null where there are others.
    virtual char const* Path() const = 0;
    virtual void Preview(ActivationPlan::FileReader const& read,
                         std::vector<PlannedFile>& files) const = 0;
    /// @param record where a step of the plan writes it; null otherwise
    virtual void Execute(AuthenticationConfiguration* record) const = 0;
};

namespace {

using namespace meaning;
using base::AsciiText::Counted;

/// A file of the host. Each message begins as that of its reader among the stores does.
std::string HostFile(std::string const& path) {
    bool const record = path == Paths::AuthenticationConfiguration;
    return ReadFile(path, record ? "Unable to open" : "Cannot open");
}

/// The policies that a policy may include.
PAMPolicyReader Policies(ActivationPlan::FileReader const& read) {
    return PAMPoliciesIn([&read](std::string const& path) -> std::optional<std::string> {
        try {
            return read(path);
        } catch (IOError const&) {
            return std::nullopt;
        }
    });
}

/// The losses that show only when the store is left again. Those of the way there hide them, and
/// are enough to refuse.
/// @param lossesOnReturn gives them; it throws where the library's reader would
template <typename LossesOnReturn>
void AddLossesOnReturn(LossesOnReturn lossesOnReturn, PlannedFile& file) {
    if (!file.losses.empty()) {
        return;
    }
    std::vector<std::string> losses;
    try {
        losses = lossesOnReturn();
    } catch (std::exception const& e) {
        losses.push_back("the library would no longer read the file: " + std::string(e.what()));
    }
    for (auto const& loss : losses) {
        file.losses.push_back(loss + " (when the store is left again)");
    }
}

void AddCommentNote(std::size_t before, std::size_t after, PlannedFile& file) {
    if (after < before) {
        file.notes.push_back(Counted(before - after, "comment") +
                             " without effect on the system would be dropped");
    }
}

std::vector<PlannedFile>::iterator FindFile(std::vector<PlannedFile>& files,
                                            std::string const& path) {
    return std::find_if(files.begin(), files.end(),
                        [&](PlannedFile const& file) { return file.path == path; });
}

/// Adds a file, or what becomes of it after all that was planned for it before.
void AddFile(PlannedFile file, std::vector<PlannedFile>& files) {
    auto const planned = FindFile(files, file.path);
    if (planned == files.end()) {
        files.push_back(std::move(file));
        return;
    }
    planned->after = std::move(file.after);
    std::move(file.losses.begin(), file.losses.end(), std::back_inserter(planned->losses));
    std::move(file.notes.begin(), file.notes.end(), std::back_inserter(planned->notes));
}

typedef std::map<std::string, std::string> Assignments;

Assignments ReadRecord(std::string const& text) {
    Assignments assignments;
    ReadAssignments(text, assignments);
    return assignments;
}

std::string PrintRecord(Assignments const& assignments) {
    std::string text;
    std::string line;
    for (auto const& assignment : assignments) {
        AssignLine(line, {assignment.first, assignment.second});
        text += line;
    }
    return text;
}

/// A store by name, from the process's factory; a program that made none gets one for the call.
std::auto_ptr<AuthenticationStore> CreateStore(std::string const& name) {
    if (AuthenticationStoreFactory* const factory = AuthenticationStoreFactory::Instance()) {
        return factory->CreateInstance(name);
    }
    AuthenticationStoreFactory factory;
    return factory.CreateInstance(name);
}

RemoteAuthenticationStore& RemoteStore(AuthenticationStore* store, std::string const& name) {
    if (!store) {
        throw UnknownRemoteAuthenticationStoreException("The specified store '" + name +
                                                        "' is unknown");
    }
    auto* const remote = dynamic_cast<RemoteAuthenticationStore*>(store);
    if (!remote) {
        throw InvalidRemoteAuthenticationStoreException("The specified store '" + name +
                                                        "' is invalid");
    }
    return *remote;
}

std::string Edited(EditForm form, std::string const& text, Edit edit,
                   SystemConfiguration::PAMEntry const& entry) {
    switch (form) {
    case EditForm::Normalised:
        break;
    case EditForm::Lossless:
        return ProviderModules::LosslessPAMPolicy(text, edit, entry);
    }
    return ProviderModules::EditedPAMPolicy(text, edit, entry);
}

std::string Edited(EditForm form, std::string const& text, Edit edit,
                   SystemConfiguration::NSSService const& service) {
    switch (form) {
    case EditForm::Normalised:
        break;
    case EditForm::Lossless:
        return ProviderModules::LosslessNSSConfiguration(text, edit, service);
    }
    return ProviderModules::EditedNSSConfiguration(text, edit, service);
}

/// Edits one of the two system files. The form in which the stores do it writes a file also where
/// that changes nothing, and what the stream they write through keeps of it.
template <typename Item>
void EditFile(EditForm form, char const* path, Edit edit, Item const& item) {
    auto const text = ReadFile(path);
    auto const edited = Edited(form, text, edit, item);
    switch (form) {
    case EditForm::Normalised:
        ReplaceFile(path, edited);
        break;
    case EditForm::Lossless:
        try {
            if (edited != text) {
                base::ReplaceFile(path, edited);
            }
        } catch (base::FileError const& failure) {
            throw IOError(failure.what());
        }
        break;
    }
}

/// Edits the PAM policy.
class PolicyStep : public ActivationStep {
public:
    PolicyStep(EditForm form, Edit edit, SystemConfiguration::PAMEntry entry)
        : _form(form), _edit(edit), _entry(std::move(entry)) {}

    char const* Path() const override {
        return Paths::PAMPolicy;
    }

    void Preview(ActivationPlan::FileReader const& read,
                 std::vector<PlannedFile>& files) const override {
        PlannedFile file;
        file.path = Path();
        file.before = read(file.path);
        file.after = Edited(_form, file.before, _edit, _entry);
        auto const reader = Policies(read);
        auto const entry = ProviderModules::Meaning(_entry, PAMFacilities[0]);
        auto const was = ReadPAMMeaning(file.before);
        auto const is = ReadPAMMeaning(file.after);
        file.losses = PAMLosses(was, is, _edit, entry, reader);
        if (_edit == Edit::insert) {
            auto const onReturn = [&] {
                auto const left = Edited(_form, file.after, Edit::remove, _entry);
                return PAMLosses(is, ReadPAMMeaning(left), Edit::remove, entry, reader);
            };
            AddLossesOnReturn(onReturn, file);
        }
        AddCommentNote(was.comments, is.comments, file);
        if (was.unreadable) {
            file.notes.emplace_back("libpam refuses the file as it is: its last line is continued, "
                                    "or too long");
        }
        files.push_back(std::move(file));
    }

    void Execute(AuthenticationConfiguration* /*record*/) const override {
        EditFile(_form, Path(), _edit, _entry);
    }

private:
    EditForm _form;
    Edit _edit;
    SystemConfiguration::PAMEntry _entry;
};

/// Edits the name-service switch.
class SwitchStep : public ActivationStep {
public:
    SwitchStep(EditForm form, Edit edit, SystemConfiguration::NSSService service)
        : _form(form), _edit(edit), _service(std::move(service)) {}

    char const* Path() const override {
        return Paths::NSSConfiguration;
    }

    void Preview(ActivationPlan::FileReader const& read,
                 std::vector<PlannedFile>& files) const override {
        PlannedFile file;
        file.path = Path();
        file.before = read(file.path);
        file.after = Edited(_form, file.before, _edit, _service);
        auto const entry = ProviderModules::Meaning(_service);
        auto const was = ReadNSSMeaning(file.before);
        auto const is = ReadNSSMeaning(file.after);
        auto const databases = EditedDatabases();
        file.losses = NSSLosses(was, is, _edit, entry, databases);
        if (_edit == Edit::insert) {
            auto const onReturn = [&] {
                auto const left = Edited(_form, file.after, Edit::remove, _service);
                return NSSLosses(is, ReadNSSMeaning(left), Edit::remove, entry, databases);
            };
            AddLossesOnReturn(onReturn, file);
            AddLossByParameters(file);
        }
        AddCommentNote(was.comments, is.comments, file);
        for (auto const line : was.faultyLines) {
            file.notes.push_back("line " + std::to_string(line) +
                                 ": the C library does not understand the criterion, and with it "
                                 "no look-up works");
        }
        files.push_back(std::move(file));
    }

    void Execute(AuthenticationConfiguration* /*record*/) const override {
        EditFile(_form, Path(), _edit, _service);
    }

private:
    /// Not a byte goes, and yet the service may be the last one that is asked: with
    /// "[NOTFOUND=return]" no user of the host's own files is found any more, root included.
    void AddLossByParameters(PlannedFile& file) const {
        if (file.losses.empty() && !_service.parameters().empty()) {
            file.losses.push_back("the service '" + _service.module() +
                                  "' comes with parameters, which decide whether those behind it "
                                  "are asked for local users");
        }
    }

    EditForm _form;
    Edit _edit;
    SystemConfiguration::NSSService _service;
};

/// Records the name of the active store. The key must be there; it is looked up when its turn
/// comes.
class RecordStep : public ActivationStep {
public:
    explicit RecordStep(std::string store) : _store(std::move(store)) {}

    char const* Path() const override {
        return Paths::AuthenticationConfiguration;
    }

    void Preview(ActivationPlan::FileReader const& read,
                 std::vector<PlannedFile>& files) const override {
        PlannedFile file;
        file.path = Path();
        file.before = read(file.path);
        auto wanted = ReadRecord(file.before);
        auto const recorded = wanted.find(Paths::RemoteAuthenticationStoreKey);
        if (recorded == wanted.end()) {
            ThrowMissingKey(Paths::RemoteAuthenticationStoreKey);
        }
        recorded->second = _store;
        file.after = PrintRecord(wanted);
        auto const made = ReadRecord(file.after);
        for (auto const& assignment : wanted) {
            auto const found = made.find(assignment.first);
            if (found == made.end() || found->second != assignment.second) {
                file.losses.push_back("the value of the key '" + assignment.first +
                                      "' would be lost");
            }
        }
        files.push_back(std::move(file));
    }

    void Execute(AuthenticationConfiguration* record) const override {
        (*record)[Paths::RemoteAuthenticationStoreKey] = _store;
        record->Write();
    }

private:
    std::string _store;
};

/// Makes another store inactive.
class WithdrawalStep : public ActivationStep {
public:
    WithdrawalStep(EditForm form, std::string store) : _form(form), _store(std::move(store)) {}

    char const* Path() const override {
        return nullptr;
    }

    void Preview(ActivationPlan::FileReader const& read,
                 std::vector<PlannedFile>& files) const override {
        std::auto_ptr<AuthenticationStore> const store = CreateStore(_store);
        auto const* const ours =
            dynamic_cast<ActiveDirectoryStore const*>(&RemoteStore(store.get(), _store));
        if (!ours) {
            return;
        }
        auto preview = ours->GetWithdrawalPlan(_form).Preview(read);
        std::move(preview.files.begin(), preview.files.end(), std::back_inserter(files));
        if (preview.refusal) {
            std::rethrow_exception(preview.refusal);
        }
    }

    void Execute(AuthenticationConfiguration* /*record*/) const override {
        std::auto_ptr<AuthenticationStore> const store = CreateStore(_store);
        auto& remote = RemoteStore(store.get(), _store);
        auto const* const ours = dynamic_cast<ActiveDirectoryStore const*>(&remote);
        if (ours && _form != EditForm::Normalised) {
            ours->GetWithdrawalPlan(_form).Execute();
        } else {
            remote.MakeInactive();
        }
    }

private:
    EditForm _form;
    std::string _store;
};

} // namespace

ProviderEntries MakeProviderEntries(std::string const& pamModule,
                                    std::list<std::string> const& pamParameters,
                                    std::string const& nssModule,
                                    std::list<std::string> const& nssParameters) {
    return {ProviderModules::PAMEntryFor(pamModule, pamParameters),
            ProviderModules::NSSServiceFor(nssModule, nssParameters)};
}

ProviderEntries MakeProviderEntries(ActiveDirectoryProvider const& provider) {
    return MakeProviderEntries(provider.PAMModule(), provider.PAMModuleParameters(),
                               provider.NSSModule(), provider.NSSModuleParameters());
}

std::vector<std::string> EditedFacilities() {
    std::vector<std::string> names;
    for (auto const facility : ProviderModules::EditedFacilities) {
        names.emplace_back(SystemConfiguration::PAMFacility(facility));
    }
    return names;
}

std::vector<std::string> EditedDatabases() {
    std::vector<std::string> names;
    for (auto const database : ProviderModules::EditedDatabases) {
        names.emplace_back(SystemConfiguration::NSSDatabase(database));
    }
    return names;
}

bool ActivationPreview::Loses() const {
    return std::any_of(files.begin(), files.end(),
                       [](PlannedFile const& file) { return !file.losses.empty(); });
}

bool ActivationPreview::Changes() const {
    return std::any_of(files.begin(), files.end(),
                       [](PlannedFile const& file) { return file.Changes(); });
}

void ActivationPlan::Append(ActivationPlan const& next) {
    auto const steps = next._steps;
    _steps.insert(_steps.end(), steps.begin(), steps.end());
}

ActivationPlan::ActivationPlan() = default;
ActivationPlan::ActivationPlan(ActivationPlan const& other) = default;
ActivationPlan& ActivationPlan::operator=(ActivationPlan const& other) = default;
ActivationPlan::~ActivationPlan() = default;

ActivationPlan ActivationPlan::Activating(ProviderEntries const& entries, std::string const& store,
                                          EditForm form) {
    ActivationPlan plan;
    plan._steps = {boost::make_shared<PolicyStep>(form, Edit::insert, entries.pam),
                   boost::make_shared<SwitchStep>(form, Edit::insert, entries.nss),
                   boost::make_shared<RecordStep>(store)};
    return plan;
}

ActivationPlan ActivationPlan::Withdrawing(ProviderEntries const& entries, EditForm form) {
    ActivationPlan plan;
    plan._steps = {boost::make_shared<PolicyStep>(form, Edit::remove, entries.pam),
                   boost::make_shared<SwitchStep>(form, Edit::remove, entries.nss)};
    return plan;
}

ActivationPlan ActivationPlan::Replacing(std::string const& previous, std::string const& store,
                                         EditForm form) {
    ActivationPlan plan;
    plan._steps = {boost::make_shared<RecordStep>(store),
                   boost::make_shared<WithdrawalStep>(form, previous)};
    return plan;
}

ActivationPlan ActivationPlan::Recording(std::string const& store) {
    ActivationPlan plan;
    plan._steps = {boost::make_shared<RecordStep>(store)};
    return plan;
}

ActivationPreview ActivationPlan::Preview() const {
    return Preview(HostFile);
}

ActivationPreview ActivationPlan::Preview(FileReader const& read) const {
    ActivationPreview preview;
    // A later step finds a file as an earlier one leaves it.
    auto const readAfterwards = [&](std::string const& path) {
        auto const planned = FindFile(preview.files, path);
        return planned == preview.files.end() ? read(path) : planned->after;
    };
    try {
        if (Find(Paths::AuthenticationConfiguration)) {
            ReadRecord(read(Paths::AuthenticationConfiguration));
        }
        for (auto const& step : _steps) {
            std::vector<PlannedFile> files;
            auto const add = [&] {
                for (auto& file : files) {
                    AddFile(std::move(file), preview.files);
                }
            };
            try {
                step->Preview(readAfterwards, files);
            } catch (std::exception const&) {
                add(); // what it would have written before
                throw;
            }
            add();
        }
    } catch (std::exception const&) {
        preview.refusal = std::current_exception();
    }
    return preview;
}

PlannedFile ActivationPlan::PreviewOf(std::string const& path, FileReader const& read) const {
    auto const* const step = Find(path);
    if (!step) {
        throw std::invalid_argument("The plan does not write '" + path + "'");
    }
    std::vector<PlannedFile> files;
    step->Preview(read, files);
    return std::move(files.front());
}

void ActivationPlan::Execute() const {
    if (Find(Paths::AuthenticationConfiguration)) {
        AuthenticationConfiguration record;
        Execute(record);
        return;
    }
    for (auto const& step : _steps) {
        step->Execute(nullptr);
    }
}

void ActivationPlan::Execute(AuthenticationConfiguration& record) const {
    for (auto const& step : _steps) {
        step->Execute(&record);
    }
}

ActivationStep const* ActivationPlan::Find(std::string const& path) const {
    auto const found = std::find_if(_steps.begin(), _steps.end(), [&](auto const& step) {
        return step->Path() && step->Path() == path;
    });
    return found == _steps.end() ? nullptr : found->get();
}

} // namespace tessel::authentication

TSLAUTH_AUTO_PTR_END
