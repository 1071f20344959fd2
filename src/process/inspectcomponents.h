#pragma once
/// \file
/// The components of the inspection layer that a process owns. The process
/// core names them but does not see them: they are made, freed and reset in
/// src/inspect, beside their operations.

#include <memory>

namespace midebug {

class TGDBThreadTable;
class TGDBBreakpointTable;
class TGDBFileTable;
class TGDBLineCache;
class TGDBMemoryCache;
class TGDBRegisterIds;
class TGDBEvaluator;

/// Frees an inspection component where its type is complete.
struct TInspectDeleter {
  void operator()(TGDBThreadTable* Component) const;
  void operator()(TGDBBreakpointTable* Component) const;
  void operator()(TGDBFileTable* Component) const;
  void operator()(TGDBLineCache* Component) const;
  void operator()(TGDBMemoryCache* Component) const;
  void operator()(TGDBRegisterIds* Component) const;
  void operator()(TGDBEvaluator* Component) const;
};
template <class T>
using TInspectPtr = std::unique_ptr<T, TInspectDeleter>;

} // namespace midebug
