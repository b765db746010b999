// Compiled for the headers that the tests share; see Testing.cmake.
