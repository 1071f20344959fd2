#pragma once
/// \file
/// The IDE's service registry and the two services of it that the remote
/// kernel uses: the remote profiles, and a profile's factory of channels to
/// its agent. The profile "local", whose agent runs inside this library and
/// starts debuggers on this machine, is always registered.

#include "kernel/raclient.h"
#include "platform/interfaced.h"

#include <map>
#include <memory>
#include <mutex>
#include <string>

namespace midebug {

/// The IDE's remote profiles by name. The order of the operations is fixed:
/// callers reach GetProfile as the third one.
class IRemoteProfileServices : public IInterface {
public:
  static constexpr TGUID IID = TGUID::Parse("{AF6D9681-143F-48FD-AC78-418DFCF6BAC8}");

  /// Adds the profile Name, or replaces the one of that name.
  virtual void AddProfile(const std::string& Name, const TIntfPtr<IInterface>& Profile) = 0;
  virtual void RemoveProfile(const std::string& Name) = 0;
  /// The profile object; null when there is no profile of that name.
  virtual TIntfPtr<IInterface> GetProfile(const std::string& Name) = 0;
};

/// Offered by a profile object: channels to the profile's agent. The order
/// of the operations is fixed: callers reach CreateChannel as the third one.
class IRemoteChannelFactory : public IInterface {
public:
  static constexpr TGUID IID = TGUID::Parse("{8EC37BDF-6280-4617-8697-A367D80C87AB}");

  virtual std::string GetProfileName() = 0;
  /// Where the agent listens; empty for the agent inside this library.
  virtual std::string GetAgentAddress() = 0;
  /// A new channel, not yet connected. The caller owns it.
  virtual std::unique_ptr<TRAClient> CreateChannel() = 0;
};

/// A registry of services by interface id. Thread-safe: FLock guards the
/// table only and is a leaf lock; a service is never released or called
/// while it is held.
class TIDEServiceRegistry {
public:
  /// Registers Service under IID, replacing what was there.
  void RegisterService(const TGUID& IID, const TIntfPtr<IInterface>& Service);
  void UnregisterService(const TGUID& IID);
  /// The object registered under IID; null when none is.
  TIntfPtr<IInterface> GetService(const TGUID& IID);
  /// The service registered under I's id, as an I; null when none is or
  /// the object does not offer I.
  template <class I>
  TIntfPtr<I> Service() {
    return QueryIntf<I>(GetService(I::IID));
  }

private:
  std::mutex FLock;
  std::map<TGUID, TIntfPtr<IInterface>> FServices;
};

/// The process-wide registry. At its first use it is given a remote profile
/// service that holds the profile "local".
TIDEServiceRegistry& VantageIDEServices();

/// The profile whose agent runs inside this library.
inline constexpr const char* LocalProfileName = "local";

/// A remote profile service keeping its profiles in a table.
TIntfPtr<IRemoteProfileServices> CreateRemoteProfileServices();
/// The profile object of "local": channels to the agent inside this library.
TIntfPtr<IInterface> CreateLocalProfile();

} // namespace midebug
