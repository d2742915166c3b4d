// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_NOREMOTEAUTHENTICATIONSTORE_H
#define TSLAUTH_NOREMOTEAUTHENTICATIONSTORE_H

#include "ActivationPlan.h"
#include "RemoteAuthenticationStore.h"

namespace tessel {
namespace authentication {

/// The configuration of the "None" store: there is nothing to say. It is a class of its own so that
/// a caller can tell it from another store's.
class TSLAUTH_EXPORT NoRemoteAuthenticationStoreConfiguration : public StoreConfiguration {
public:
    ~NoRemoteAuthenticationStoreConfiguration() override;
};

/// "None": local accounts alone. It edits neither the PAM policy nor the name-service switch; the
/// store that was active before takes its own entries out.
class TSLAUTH_EXPORT NoRemoteAuthenticationStore : public RemoteAuthenticationStore {
public:
    TSLAUTH_AUTO_PTR_BEGIN
    /// An empty `NoRemoteAuthenticationStoreConfiguration`. Does not block.
    std::auto_ptr<StoreConfiguration> GetStoreConfiguration() const override;
    TSLAUTH_AUTO_PTR_END

    /// "None"
    std::string GetDisplayName() const override;

    /// What `MakeActive` would do now, to be looked at before it is done. With a form other than
    /// its own, it is to be executed by the caller.
    /// @throws IOError, ConfigurationError, InvalidKeyException where `authentication.conf` cannot
    ///     be read
    ActivationPlan GetActivationPlan(EditForm form = EditForm::Normalised) const;

    /// Records "None" and withdraws the store that was recorded before. Where "None" is recorded
    /// already, nothing is written and no store is touched.
    ///
    /// "None" is recorded first: when the earlier store then cannot be withdrawn, its failure
    /// leaves this call, the record stays "None", and a second call returns at once.
    ///
    /// @throws IOError, ConfigurationError, InvalidKeyException where `authentication.conf` cannot
    ///     be read or written; then nothing has changed
    /// @throws FilePermissionError where its old permissions could not be kept; "None" is recorded
    /// @throws UnknownRemoteAuthenticationStoreException where no store of the recorded name exists
    /// @throws InvalidRemoteAuthenticationStoreException where the recorded store is no remote one
    /// @throws what the earlier store's constructor and `MakeInactive` throw
    void MakeActive() override;

    ~NoRemoteAuthenticationStore() override;

    /// Always throws `std::runtime_error`, which is not an `Exception`, with the text "Attempted to
    /// disable None Store": a host stops being local by activating another store.
    void MakeInactive() override;

private:
    ActivationPlan PlanFor(AuthenticationConfiguration const& record, EditForm form) const;
};

} // namespace authentication
} // namespace tessel

#endif
