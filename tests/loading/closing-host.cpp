// Opens the library in the first argument, keeps the object that the library gives, and closes the library.
// Then uses the object, the class methods that the library added, and the library's function once more. The
// text that it sees must equal the second argument.
#include <dlfcn.h>

#include <cstdio>
#include <string>

#include "Registry.h"
#include "Runtime/Objects/String.h"
#include "Shared/Logging/LUMLogMessage.h"
#include "guest.h"

namespace {

int fail(const char* what, const std::string& seen) {
  std::fprintf(stderr, "%s: %s\n", what, seen.c_str());
  return 1;
}

std::string textOf(const rt::Ref<rt::Object>& gift) {
  const auto* message = rt::cast<LUMLogMessage>(gift.get());
  if (message == nullptr) return std::string(gift->description());
  std::string text;
  for (const rt::String& part : {message->format(), message->file(), message->function()}) {
    text.append(text.empty() ? "" : ", ").append(part);
  }
  return text;
}

}  // namespace

int main(int argumentCount, char** arguments) {
  if (argumentCount != 3) return 1;
  void* const guest = dlopen(arguments[1], RTLD_NOW | RTLD_LOCAL);
  if (guest == nullptr) return fail("not opened", dlerror());
  auto* const give = reinterpret_cast<Give*>(dlsym(guest, "give"));
  if (give == nullptr) return fail("no such function", dlerror());
  rt::Ref<rt::Object> gift;
  give(gift);
  if (dlclose(guest) != 0) return fail("not closed", dlerror());

  const auto seen = [&gift] { return textOf(gift) + " " + Registry::look(); };
  if (seen() != arguments[2]) return fail("kept", seen());
  give(gift);
  if (seen() != arguments[2]) return fail("given again", seen());
  return 0;
}
