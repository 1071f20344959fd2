#pragma once
/// \file
/// Files, directories, environment variables and the host's own locations.

#include <string>

namespace midebug {

bool FileExists(const std::string& Path);
bool DirectoryExists(const std::string& Path);

/// Creates Path with every missing parent. True when the directory exists
/// afterwards.
bool ForceDirectories(const std::string& Path);

/// Path made absolute against the current directory, without requiring it to
/// exist.
std::string ExpandFileName(const std::string& Path);

/// The directory part of Path without a trailing separator; empty for a bare
/// file name.
std::string ExtractFileDir(const std::string& Path);

/// The file-name part of Path.
std::string ExtractFileName(const std::string& Path);

/// Full path of the first executable Name on PATH, or empty. A name that holds
/// a separator is not looked up.
std::string FindOnPath(const std::string& Name);

/// True when Path names an existing file, or is a bare program name that PATH
/// has.
bool ProgramExists(const std::string& Path);

/// The value of an environment variable, empty when unset.
std::string GetEnvironmentVariable(const std::string& Name);

std::string GetCurrentDir();

/// Directory of the running executable.
std::string HostExecutableDir();

/// The IDE's root directory, under which debugger support files live. Set by
/// the host; when it never did, the environment variable MIDEBUG_ROOT.
std::string HostRootDirectory();
void SetHostRootDirectory(const std::string& Path);

constexpr char PathDelimiter = '/';

} // namespace midebug
