#pragma once

#include <string>

/// Looks up which cases of a GoogleTest program are listed in NotShown.txt: a shim stands in for what they
/// mean to show, or the runner cannot do what they need. Such cases are not run.
///
/// If the arguments select a listed case, prints that it is skipped and why, as GoogleTest does, and returns
/// true. If they select no single case, excludes the listed ones, says so on standard error, and returns
/// false.
bool skipCasesNotShown(const std::string& program, int count, char** arguments);
