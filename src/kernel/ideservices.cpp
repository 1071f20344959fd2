#include "kernel/ideservices.h"

#include "kernel/localagent.h"

#include <utility>

namespace midebug {

namespace {

/// Profiles by name. FLock guards the table only; a profile is never
/// released while it is held.
class TRemoteProfileServices : public TInterfaced<IRemoteProfileServices> {
public:
  void AddProfile(const std::string& Name, const TIntfPtr<IInterface>& Profile) override {
    TIntfPtr<IInterface> Replaced = Profile;
    std::lock_guard Guard(FLock);
    FProfiles[Name].Swap(Replaced);
  }

  void RemoveProfile(const std::string& Name) override {
    TIntfPtr<IInterface> Removed;
    std::lock_guard Guard(FLock);
    if (const auto Found = FProfiles.find(Name); Found != FProfiles.end()) {
      Removed.Swap(Found->second);
      FProfiles.erase(Found);
    }
  }

  TIntfPtr<IInterface> GetProfile(const std::string& Name) override {
    std::lock_guard Guard(FLock);
    const auto Found = FProfiles.find(Name);
    return Found == FProfiles.end() ? nullptr : Found->second;
  }

private:
  std::mutex FLock;
  std::map<std::string, TIntfPtr<IInterface>> FProfiles;
};

class TLocalProfile : public TInterfaced<IRemoteChannelFactory> {
public:
  std::string GetProfileName() override { return LocalProfileName; }
  std::string GetAgentAddress() override { return {}; }
  std::unique_ptr<TRAClient> CreateChannel() override { return std::make_unique<TLocalAgentClient>(); }
};

} // namespace

// The replaced or removed reference is declared before the guard, so it is
// released after the lock: its last Release may run any code.

void TIDEServiceRegistry::RegisterService(const TGUID& IID, const TIntfPtr<IInterface>& Service) {
  TIntfPtr<IInterface> Replaced = Service;
  std::lock_guard Guard(FLock);
  FServices[IID].Swap(Replaced);
}

void TIDEServiceRegistry::UnregisterService(const TGUID& IID) {
  TIntfPtr<IInterface> Removed;
  std::lock_guard Guard(FLock);
  if (const auto Found = FServices.find(IID); Found != FServices.end()) {
    Removed.Swap(Found->second);
    FServices.erase(Found);
  }
}

TIntfPtr<IInterface> TIDEServiceRegistry::GetService(const TGUID& IID) {
  std::lock_guard Guard(FLock);
  const auto Found = FServices.find(IID);
  return Found == FServices.end() ? nullptr : Found->second;
}

TIntfPtr<IRemoteProfileServices> CreateRemoteProfileServices() { return new TRemoteProfileServices; }

TIntfPtr<IInterface> CreateLocalProfile() {
  TIntfPtr<IRemoteChannelFactory> Profile = new TLocalProfile;
  return Profile;
}

TIDEServiceRegistry& VantageIDEServices() {
  static TIDEServiceRegistry Registry;
  // A thread that arrives while another registers the profile waits here.
  static const bool LocalProfileRegistered = [] {
    const TIntfPtr<IRemoteProfileServices> Profiles = CreateRemoteProfileServices();
    Profiles->AddProfile(LocalProfileName, CreateLocalProfile());
    Registry.RegisterService(IRemoteProfileServices::IID, Profiles);
    return true;
  }();
  (void)LocalProfileRegistered;
  return Registry;
}

} // namespace midebug
