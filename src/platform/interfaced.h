#pragma once
/// \file
/// Reference-counted interfaces: identifiers, the root interface, the holder
/// of one reference and the objects that implement interfaces. Every
/// interface that crosses the library's boundary is built on these.

#include "platform/hexdigits.h"
#include "platform/types.h"

#include <array>
#include <atomic>
#include <compare>
#include <cstddef>
#include <cstdint>
#include <string_view>
#include <tuple>
#include <type_traits>
#include <utility>

namespace midebug {


/// A 128-bit interface identifier.
struct TGUID {
  uint32_t D1 = 0;
  uint16_t D2 = 0;
  uint16_t D3 = 0;
  std::array<uint8_t, 8> D4{};

  /// Reads the registry form "{XXXXXXXX-XXXX-XXXX-XXXX-XXXXXXXXXXXX}"
  /// (hexadecimal digits in either case). Any other text gives the null
  /// identifier, which no interface uses.
  static constexpr TGUID Parse(std::string_view Text);

  friend constexpr bool operator==(const TGUID&, const TGUID&) = default;
  friend constexpr auto operator<=>(const TGUID&, const TGUID&) = default;
};

namespace guiddetail {

/// The value of Count hexadecimal digits at Pos, or -1 when one is not a
/// digit.
constexpr int64_t HexValue(std::string_view Text, std::size_t Pos, std::size_t Count) {
  int64_t Value = 0;
  for (std::size_t Index = Pos; Index < Pos + Count; ++Index) {
    const int Digit = HexDigitValue(Text[Index]);
    if (Digit < 0)
      return -1;
    Value = Value * 16 + Digit;
  }
  return Value;
}

} // namespace guiddetail

constexpr TGUID TGUID::Parse(std::string_view Text) {
  // {XXXXXXXX-XXXX-XXXX-XXXX-XXXXXXXXXXXX}: 38 characters.
  if (Text.size() != 38 || Text[0] != '{' || Text[37] != '}' || Text[9] != '-' || Text[14] != '-' ||
      Text[19] != '-' || Text[24] != '-')
    return TGUID{};
  const int64_t D1 = guiddetail::HexValue(Text, 1, 8);
  const int64_t D2 = guiddetail::HexValue(Text, 10, 4);
  const int64_t D3 = guiddetail::HexValue(Text, 15, 4);
  if (D1 < 0 || D2 < 0 || D3 < 0)
    return TGUID{};
  TGUID Result{static_cast<uint32_t>(D1), static_cast<uint16_t>(D2), static_cast<uint16_t>(D3), {}};
  // The last eight bytes: two before the fourth hyphen, six after it.
  constexpr std::array<std::size_t, 8> BytePos = {20, 22, 25, 27, 29, 31, 33, 35};
  for (std::size_t Index = 0; Index < BytePos.size(); ++Index) {
    const int64_t Byte = guiddetail::HexValue(Text, BytePos[Index], 2);
    if (Byte < 0)
      return TGUID{};
    Result.D4[Index] = static_cast<uint8_t>(Byte);
  }
  return Result;
}

/// QueryInterface answers.
inline constexpr int32_t IntfResultOk = 0;
inline constexpr int32_t IntfResultNoInterface = static_cast<int32_t>(0x80004002u);

/// The root of every interface: reference counting and the question for
/// another interface of the same object. Interfaces are never deleted
/// through a pointer to them; the object deletes itself on its last
/// Release.
class IInterface {
public:
  static constexpr TGUID IID = TGUID::Parse("{00000000-0000-0000-C000-000000000046}");

  virtual int32_t QueryInterface(const TGUID& IID, void** Obj) = 0;
  virtual int32_t AddRef() = 0;
  virtual int32_t Release() = 0;
protected:
  ~IInterface() = default;
};

/// Holds one reference to an interface: taking a raw pointer adds a
/// reference, dropping the holder releases it.
template <class I>
class TIntfPtr {
public:
  TIntfPtr() noexcept = default;
  TIntfPtr(std::nullptr_t) noexcept {}
  TIntfPtr(I* Intf) : FIntf(Intf) {
    if (FIntf)
      FIntf->AddRef();
  }
  TIntfPtr(const TIntfPtr& Other) : TIntfPtr(Other.FIntf) {}
  TIntfPtr(TIntfPtr&& Other) noexcept : FIntf(std::exchange(Other.FIntf, nullptr)) {}
  /// From a holder of a derived interface.
  template <class J>
    requires std::is_convertible_v<J*, I*>
  TIntfPtr(const TIntfPtr<J>& Other) : TIntfPtr(static_cast<I*>(Other.get())) {}
  template <class J>
    requires std::is_convertible_v<J*, I*>
  TIntfPtr(TIntfPtr<J>&& Other) noexcept : FIntf(Other.Detach()) {}

  ~TIntfPtr() {
    if (FIntf)
      FIntf->Release();
  }

  TIntfPtr& operator=(const TIntfPtr& Other) {
    TIntfPtr(Other).Swap(*this);
    return *this;
  }
  TIntfPtr& operator=(TIntfPtr&& Other) noexcept {
    TIntfPtr(std::move(Other)).Swap(*this);
    return *this;
  }
  TIntfPtr& operator=(std::nullptr_t) {
    reset();
    return *this;
  }

  /// Takes over a reference the caller already holds (the one QueryInterface
  /// added, for instance) without adding another.
  static TIntfPtr Adopt(I* Intf) noexcept {
    TIntfPtr Result;
    Result.FIntf = Intf;
    return Result;
  }
  /// Gives up the held reference to the caller without releasing it.
  I* Detach() noexcept { return std::exchange(FIntf, nullptr); }

  void reset() { TIntfPtr().Swap(*this); }
  void Swap(TIntfPtr& Other) noexcept { std::swap(FIntf, Other.FIntf); }

  I* get() const noexcept { return FIntf; }
  I* operator->() const noexcept { return FIntf; }
  I& operator*() const noexcept { return *FIntf; }
  explicit operator bool() const noexcept { return FIntf != nullptr; }

  friend bool operator==(const TIntfPtr& Left, std::nullptr_t) noexcept { return Left.FIntf == nullptr; }
  template <class J>
  friend bool operator==(const TIntfPtr& Left, const TIntfPtr<J>& Right) noexcept {
    return Left.get() == Right.get();
  }

private:
  I* FIntf = nullptr;
};

/// Asks the object behind Source for interface J; null when it has none.
template <class J, class I>
TIntfPtr<J> QueryIntf(const TIntfPtr<I>& Source) {
  void* Obj = nullptr;
  if (!Source || Source->QueryInterface(J::IID, &Obj) != IntfResultOk)
    return nullptr;
  return TIntfPtr<J>::Adopt(static_cast<J*>(Obj));
}

/// The reference count behind interfaces. The count starts at 0; the first
/// TIntfPtr takes it to 1, and the Release that brings it back to 0 deletes
/// the object. Counts may change on any thread.
class TInterfacedObject {
public:
  TInterfacedObject() = default;
  TInterfacedObject(const TInterfacedObject&) = delete;
  TInterfacedObject& operator=(const TInterfacedObject&) = delete;
  virtual ~TInterfacedObject() = default;

  Integer RefCount() const noexcept { return FRefCount.load(std::memory_order_relaxed); }

protected:
  int32_t DoAddRef() noexcept { return FRefCount.fetch_add(1, std::memory_order_relaxed) + 1; }
  int32_t DoRelease() noexcept {
    // acq_rel: every write made through other references happens before the
    // deletion on the thread that drops the last one.
    const int32_t Remaining = FRefCount.fetch_sub(1, std::memory_order_acq_rel) - 1;
    if (Remaining == 0) {
      BeforeDestruction();
      delete this;
    }
    return Remaining;
  }
  /// Runs when the last reference has gone, just before deletion, while the
  /// object is still whole: the place to stop threads that call into it.
  virtual void BeforeDestruction() {}

private:
  std::atomic<int32_t> FRefCount{0};
};

/// An object implementing the interfaces Intfs, each of which names its
/// identifier as I::IID. Supplies the three operations of IInterface once
/// for all of them; QueryInterface answers for each of Intfs and for
/// IInterface itself.
template <class... Intfs>
  requires(sizeof...(Intfs) > 0)
class TInterfaced : public TInterfacedObject, public Intfs... {
public:
  int32_t QueryInterface(const TGUID& IID, void** Obj) override {
    if (!Obj)
      return IntfResultNoInterface;
    *Obj = nullptr;
    // The pointer handed out must be of exactly the interface asked for.
    const bool Found = IID == IInterface::IID ? Offer<IInterface, FirstIntf>(Obj) : (Offer<Intfs>(IID, Obj) || ...);
    if (!Found)
      return IntfResultNoInterface;
    DoAddRef();
    return IntfResultOk;
  }
  int32_t AddRef() final { return DoAddRef(); }
  int32_t Release() final { return DoRelease(); }

private:
  using FirstIntf = std::tuple_element_t<0, std::tuple<Intfs...>>;

  /// Stores this object as an I*, reached through Via when I is ambiguous.
  template <class I, class Via = I>
  bool Offer(void** Obj) {
    *Obj = static_cast<I*>(static_cast<Via*>(this));
    return true;
  }
  template <class I>
  bool Offer(const TGUID& IID, void** Obj) {
    return IID == I::IID && Offer<I>(Obj);
  }
};

} // namespace midebug
