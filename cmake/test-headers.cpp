// Owns the precompiled headers that all tests share; see Testing.cmake.
