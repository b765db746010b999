#pragma once

/// A function that a program may define to do something before the registry looks for bindings modules. The
/// library's own definition does nothing and returns true.
///
///     bool SRLStartUpHook() {
///       prepareConfigurations();
///       return true;
///     }
///
/// It runs when the program is loaded, before `main` and before the program's static objects are constructed.
/// The registry ignores the result.
///
/// Not for: work that can wait until `main`.

bool SRLStartUpHook();
