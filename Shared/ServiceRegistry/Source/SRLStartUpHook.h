#pragma once

/// Where a program can do something before the registry looks for bindings modules: it defines this function
/// itself, in place of the library's own, which does nothing and returns true.
///
///     bool SRLStartUpHook() {
///       prepareConfigurations();
///       return true;
///     }
///
/// It runs when the program is loaded, before `main` and before the program's static objects are made. Its
/// result is not looked at.
///
/// Not for: what can wait until `main`.

bool SRLStartUpHook();
