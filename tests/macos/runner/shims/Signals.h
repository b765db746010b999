#pragma once

#include <csignal>
#include <cstdint>

/// Convert the number of a signal. Several differ.
int darwinSignal(int linuxSignal);
int linuxSignal(int darwinSignal);

/// A set of signals on macOS has 32 bits.
using DarwinSignals = std::uint32_t;

sigset_t linuxSignals(DarwinSignals signals);
DarwinSignals darwinSignals(const sigset_t& signals);
