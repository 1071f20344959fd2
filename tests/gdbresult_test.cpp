// Result objects and interface reference counting.

#include "mi/gdbresult.h"
#include "process/gdbinterfaces.h"

#include <gtest/gtest.h>

#include <atomic>
#include <string>

namespace midebug {
namespace {

// ---------------------------------------------------------------------------
// Result objects

TEST(ResultErrorMessage, DebuggerEscapesBecomeLineBreaksAndBlanks) {
  struct Case {
    std::string Raw;
    std::string Expected;
  };
  const Case Cases[] = {
      {R"(a\nb\tc)", "a\r\nb   c"},
      {R"(\n\n)", "\r\n\r\n"},
      {"", ""},
      {"plain", "plain"},
      // A lone trailing backslash and unknown escapes stay as they came.
      {R"(end\)", R"(end\)"},
      {R"(\x41\")", R"(\x41\")"},
      // An escaped backslash before n is a path, not a line break.
      {R"(No file C:\\new\\tmp.c)", R"(No file C:\\new\\tmp.c)"},
  };
  for (const Case& Each : Cases) {
    TGDBResult Result(ctUnknown);
    Result.SetErrorMessage(Each.Raw);
    EXPECT_EQ(Result.FErrorMessage, Each.Expected) << Each.Raw;
    EXPECT_FALSE(Result.FError) << "SetErrorMessage must not flag the failure";
  }
}

TEST(ResultThreadNames, FixupNameKeepsTheShortName) {
  struct Case {
    std::string Name;
    std::string Expected;
  };
  const Case Cases[] = {
      {"Thread 0x1a2b", "0x1a2b"},
      {"main.worker", "worker"},
      {"worker", "worker"},
      {"LWP 1234", "1234"},
      // The blank wins over an earlier full stop.
      {"a.b c", "c"},
      {"", ""},
  };
  for (const Case& Each : Cases)
    EXPECT_EQ(TThreadInfoResult::FixupName(Each.Name), Each.Expected) << Each.Name;
}

// ---------------------------------------------------------------------------
// Interface identity and reference counting

class ITestProbe : public IInterface {
public:
  static constexpr TGUID IID = TGUID::Parse("{0B1F6E2A-1C3D-4E5F-8A9B-0C1D2E3F4A5B}");
  virtual Integer Value() = 0;
};

class ITestOther : public IInterface {
public:
  static constexpr TGUID IID = TGUID::Parse("{7A6B5C4D-3E2F-4A1B-9C8D-7E6F5A4B3C2D}");
  virtual Integer Other() = 0;
};

/// Counts its deletions so that a test sees a double or missing delete.
class TProbe : public TInterfaced<ITestProbe, ITestOther> {
public:
  explicit TProbe(std::atomic<int>& Deleted) : FDeleted(Deleted) {}
  ~TProbe() override { ++FDeleted; }
  Integer Value() override { return 42; }
  Integer Other() override { return 7; }

private:
  std::atomic<int>& FDeleted;
};

TEST(IntfRefCount, CopiesAndMovesShareOneObjectDeletedOnce) {
  std::atomic<int> Deleted{0};
  auto* Object = new TProbe(Deleted);
  {
    TIntfPtr<ITestProbe> First = Object;
    EXPECT_EQ(Object->RefCount(), 1);
    TIntfPtr<ITestProbe> Copy = First;
    EXPECT_EQ(Object->RefCount(), 2);
    TIntfPtr<ITestProbe> Moved = std::move(Copy);
    EXPECT_TRUE(Copy == nullptr);

    TIntfPtr<ITestProbe>& Alias = Moved;
    Moved = Alias; // self-assignment must not drop the object
    EXPECT_EQ(Object->RefCount(), 2);
    TIntfPtr<ITestProbe> Assigned;
    Assigned = First;
    EXPECT_EQ(Object->RefCount(), 3);
    Assigned = std::move(Moved);
    EXPECT_EQ(Object->RefCount(), 2);
    First.reset();
    EXPECT_EQ(Object->RefCount(), 1);
    EXPECT_EQ(Deleted, 0);
  }
  EXPECT_EQ(Deleted, 1);
}

} // namespace
} // namespace midebug
