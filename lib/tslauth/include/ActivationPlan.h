// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_ACTIVATIONPLAN_H
#define TSLAUTH_ACTIVATIONPLAN_H

#include "Export.h"
#include "systemconfiguration/NSSService.h"
#include "systemconfiguration/PAMEntry.h"

#include <boost/shared_ptr.hpp>

#include <exception>
#include <functional>
#include <list>
#include <string>
#include <vector>

namespace tessel {
namespace authentication {

class ActivationStep;
class ActiveDirectoryProvider;
class AuthenticationConfiguration;

/// What a provider brings into the two system files.
struct ProviderEntries {
    SystemConfiguration::PAMEntry pam;
    SystemConfiguration::NSSService nss;
};

/// The entries of a provider with these modules and parameters; see `ActiveDirectoryProvider`.
TSLAUTH_EXPORT ProviderEntries MakeProviderEntries(std::string const& pamModule,
                                                   std::list<std::string> const& pamParameters,
                                                   std::string const& nssModule,
                                                   std::list<std::string> const& nssParameters);
TSLAUTH_EXPORT ProviderEntries MakeProviderEntries(ActiveDirectoryProvider const& provider);

/// The facilities of the PAM policy that hold a provider's entry, in the order in which they are
/// edited: "auth", "account".
TSLAUTH_EXPORT std::vector<std::string> EditedFacilities();

/// The databases of the name-service switch that hold a provider's service, in the order in which
/// they are edited: "passwd", "group", "shadow".
TSLAUTH_EXPORT std::vector<std::string> EditedDatabases();

/// How the two system files are edited.
enum class EditForm {
    /// As the stores do it, through the models: only what they know survives, in the form that they
    /// print.
    Normalised,
    /// Only the lines concerned change, and a file stays as it is where none is. Its links, owner,
    /// access control list and extended attributes stay as well. A text that a model cannot read is
    /// understood as the C library and libpam read it; where a model can read the outcome, it finds
    /// what a store would have inserted, in the same places, and a store takes it out.
    /// `Withdrawing` takes out every copy. A text in which the readers would not all find what is
    /// inserted is refused with a `ConfigurationError`.
    Lossless
};

/// One file that a plan writes, as it is and as it is going to be.
struct PlannedFile {
    std::string path;
    std::string before;
    std::string after;
    /// What the edit takes away beyond what it is meant to do, a sentence each: entries that would
    /// be lost or altered, now or when the store is left again, as the C library and libpam read
    /// them.
    std::vector<std::string> losses;
    /// What is worth knowing and costs nothing.
    std::vector<std::string> notes;

    bool Changes() const {
        return before != after;
    }
};

/// What a plan would do to a host as it is.
struct TSLAUTH_EXPORT ActivationPreview {
    /// In the order in which they would be written; unchanged ones, too.
    std::vector<PlannedFile> files;
    /// What would be thrown, after `files` had been written. Null where nothing would.
    std::exception_ptr refusal;

    bool Loses() const;
    bool Changes() const;
};

/// What brings a host from one store to another: edits of files, in the order in which the files
/// are written. The stores execute such plans (`ActiveDirectoryStore::GetActivationPlan`,
/// `GetWithdrawalPlan`, `NoRemoteAuthenticationStore::GetActivationPlan`), so that whoever asks for
/// one first sees what they will write, and may refuse.
///
/// A value: making one opens no file, copies share what they hold, and each may be used by any
/// thread. What it says of a host holds as long as nobody else edits the files; see `HostLock`.
class TSLAUTH_EXPORT ActivationPlan {
public:
    /// Gives the text of a file by its path, or throws.
    typedef std::function<std::string(std::string const&)> FileReader;

    /// Does nothing.
    ActivationPlan();

    /// Puts a provider's entries into the PAM policy and then into the name-service switch, and
    /// then records `store`.
    static ActivationPlan Activating(ProviderEntries const& entries, std::string const& store,
                                     EditForm form = EditForm::Normalised);

    /// Takes a provider's entries out of the PAM policy and then out of the name-service switch.
    static ActivationPlan Withdrawing(ProviderEntries const& entries,
                                      EditForm form = EditForm::Normalised);

    /// Records `store`, and then makes the store `previous` inactive.
    /// @param form of the files that the library's own stores edit; any other store is asked to do
    ///     it
    static ActivationPlan Replacing(std::string const& previous, std::string const& store,
                                    EditForm form = EditForm::Normalised);

    /// Records `store` and does no more: for a host whose recorded store cannot be made any longer,
    /// since its provider ends whoever loads it. Its entries stay; see `Withdrawing`.
    static ActivationPlan Recording(std::string const& store);

    ActivationPlan(ActivationPlan const& other);
    ActivationPlan& operator=(ActivationPlan const& other);
    ~ActivationPlan();

    /// Does what `next` does behind what this does.
    void Append(ActivationPlan const& next);

    /// What `Execute` would do to this host. Blocks for the disk; writes nothing. Where a store is
    /// made inactive, its provider is loaded. Of a store that is not one of the library's own it is
    /// not known what it writes, and none of its files is shown.
    ActivationPreview Preview() const;

    /// The same for other texts than the host's. Opens no file; but see above for a provider.
    /// @param read is asked for the files that are written, and for policies that they include
    ActivationPreview Preview(FileReader const& read) const;

    /// The same for one file that the plan itself writes.
    /// @throws what executing the plan would throw for it; std::invalid_argument for any other file
    PlannedFile PreviewOf(std::string const& path, FileReader const& read) const;

    /// Carries the plan out, one file after the other. Each is read anew, replaced whole or left as
    /// it was, and an earlier one stays replaced when a later one fails. A record is read before
    /// anything is written: a host without one is left alone.
    /// @throws as `ActiveDirectoryStore::MakeActive` does for the files that the plan writes
    void Execute() const;

    /// The same with a record that has been read already; it is changed as the file is.
    void Execute(AuthenticationConfiguration& record) const;

private:
    ActivationStep const* Find(std::string const& path) const;

    std::vector<boost::shared_ptr<ActivationStep const>> _steps;
};

} // namespace authentication
} // namespace tessel

#endif
