// This program has bindings modules in itself and in the libraries that it links. It opens another library
// with a module, the first argument. Checks which modules were asked, when and in which order, and which
// services exist.
#include <dlfcn.h>

#include <cstddef>
#include <cstdio>
#include <cstring>
#include <string>
#include <string_view>

#include "Libraries/Util/ErrorHandler/PECErrorHandler.h"
#include "Runtime/Objects/ClassMethod.h"
#include "Shared/ServiceRegistry/ServiceRegistry.h"
#include "Shared/ServiceRegistry/Source/SRLStartUpHook.h"
#include "Trace.h"

using namespace rt::literals;

namespace {

// The trace begins before static objects are constructed, so these variables need constant initialisation.
constinit char traced[4096] = "";
constinit std::size_t tracedSize = 0;

void add(std::string_view text) {
  if (text.size() >= sizeof traced - tracedSize) return;
  std::memcpy(traced + tracedSize, text.data(), text.size());
  tracedSize += text.size();
  traced[tracedSize] = '\0';
}

// The trace when the program's static objects are constructed.
const std::string tracedBeforeStaticObjects = traced;

constexpr SRLAPIRegistrationData early{.identifier = "early", .identifierLength = 5};

// A class method that returns no module.
template <char mark>
const SRLBindingsModuleData* noModule() {
  static constexpr char kMark[] = {mark, '\0'};
  trace("is asked, and no module: ", kMark);
  return nullptr;
}

void noModuleEither() {
  trace("is called");
}

}  // namespace

template struct rt::AddedClassMethod<SRLRegistry, "srl_bindings", &noModule<'1'>>;
template struct rt::AddedClassMethod<SRLRegistry, "srl_binding", &noModule<'2'>>;
template struct rt::AddedClassMethod<SRLRegistry, "srl_BindingsA", &noModule<'3'>>;
template struct rt::AddedClassMethod<SRLRegistry, "_srl_bindingsA", &noModule<'4'>>;
// These two selectors are those of modules. The first method returns no module. The second has the wrong type
// and cannot be called.
template struct rt::AddedClassMethod<SRLRegistry, "srl_bindingsNone", &noModule<'5'>>;
template struct rt::AddedClassMethod<SRLRegistry, "srl_bindingsOfAnotherType", &noModuleEither>;

void trace(const char* text, const char* name) {
  add(text);
  add(name);
  add("\n");
}

bool SRLStartUpHook() {
  trace("start-up hook");
  PECErrorHandler::sharedInstance()->setErrorHandlerBlock(
      [](const rt::Ref<PECErrorDescription>& error) { add(error->errorMessage().view()), add("\n"); });
  if (SRLRegistry::sharedInstance()->internalService(&early, {})) trace("too early, and found");
  // The registry ignores the result.
  return false;
}

namespace {

int fail(const char* what, const std::string& seen) {
  std::fprintf(stderr, "%s: %s\n", what, seen.c_str());
  return 1;
}

// Clears the trace.
void forget() {
  tracedSize = 0;
  traced[0] = '\0';
}

}  // namespace

int main(int argumentCount, char** arguments) {
  if (argumentCount != 2) return 1;

  const std::string prior =
      "A service injector was called prior to service bindings being registered.\n\nService: ";
  const char* const names[] = {"InArchive1", "InArchive2", "InArchive3", "InProgram", "InShared"};
  std::string expected = "start-up hook\n" + prior + "early\n";
  for (const std::string name : names) expected += "is asked: " + name + "\n";
  expected += "is asked, and no module: 5\n";
  for (const std::string name : names) {
    expected.append("configures ").append(name).append("\n").append(prior).append(name).append("\n");
  }
  if (tracedBeforeStaticObjects != expected) return fail("before main", tracedBeforeStaticObjects);
  if (traced != expected) return fail("by main", traced);
  forget();

  const rt::Ref<SRLRegistry> registry = SRLRegistry::sharedInstance();
  const auto serviceNamed = [&](const char* name) {
    const SRLAPIRegistrationData* api = registry->apiIdentifierFromString(rt::String::fromUTF8(name));
    return api != nullptr ? registry->internalService(api, {}) : nullptr;
  };
  for (const char* name : names) {
    const rt::Ref<rt::Object> service = serviceNamed(name);
    if (!service || service->classInfo().name != name) return fail("no service", name);
  }
  if (registry->registeredAPIIdentifiers()->count() != std::size(names)) return fail("too many APIs", "");
  if (tracedSize != 0) return fail("while services were asked for", traced);

  void* const opened = dlopen(arguments[1], RTLD_NOW | RTLD_LOCAL);
  if (opened == nullptr) return fail("not opened", dlerror());
  auto* const apiOfOpened =
      reinterpret_cast<const SRLAPIRegistrationData* (*)()>(dlsym(opened, "apiOfOpened"));
  if (apiOfOpened == nullptr) return fail("no such function", dlerror());
  bool isAdded = false;
  for (const rt::ClassMethod& method : rt::classMethods(rt::classInfo<SRLRegistry>())) {
    isAdded |= method.selector() == "srl_bindingsInOpened";
  }
  if (!isAdded) return fail("the opened library has no module", "");
  if (registry->internalService(apiOfOpened(), {})) return fail("found", "InOpened");
  if (serviceNamed("InOpened")) return fail("found by name", "InOpened");
  if (std::string_view(traced) != "No binding was found for required, single-bound service: InOpened\n") {
    return fail("when a library was opened", traced);
  }
  return 0;
}
