#include "tests/support/EnvironmentTrace.h"

#include <fcntl.h>
#include <sys/ptrace.h>
#include <sys/user.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <map>
#include <sstream>
#include <stdexcept>

#include "tests/support/Process.h"

namespace {

using Address = unsigned long;

constexpr Address kBreakpointMask = 0xff;
constexpr Address kBreakpoint = 0xcc;

void require(bool succeeded, const char* what) {
  if (!succeeded) throw std::runtime_error(what);
}

// Returns the addresses of the C library's look-up functions, relative to the program's load address.
std::set<Address> lookUps(const std::string& symbolsPath) {
  std::istringstream symbols(runProcess({"nm", symbolsPath}).standardOutput);
  std::set<Address> addresses;
  Address address = 0;
  std::string kind;
  std::string name;
  for (std::string line; std::getline(symbols, line);) {
    std::istringstream words(line);
    if (!(words >> std::hex >> address >> kind >> name)) continue;
    if (name == "getenv" || name == "secure_getenv") addresses.insert(address);
  }
  require(!addresses.empty(), "there is no symbol of the environment's look-up");
  return addresses;
}

Address loadAddress(pid_t process, const std::string& path) {
  std::ifstream maps("/proc/" + std::to_string(process) + "/maps");
  for (std::string line; std::getline(maps, line);) {
    if (line.find(path) != std::string::npos) return std::stoul(line, nullptr, 16);
  }
  throw std::runtime_error("the program's file is not mapped");
}

Address readWord(pid_t process, Address address) {
  errno = 0;
  const long word = ptrace(PTRACE_PEEKTEXT, process, address, nullptr);
  require(errno == 0, "cannot read the program's memory");
  return static_cast<Address>(word);
}

void writeWord(pid_t process, Address address, Address word) {
  require(ptrace(PTRACE_POKETEXT, process, address, word) == 0, "cannot write the program's memory");
}

std::string readText(pid_t process, Address address) {
  std::string text;
  for (;; ++address) {
    const char byte = static_cast<char>(readWord(process, address) & 0xff);
    if (byte == '\0') return text;
    text.push_back(byte);
  }
}

bool waitForStop(pid_t process) {
  int status = 0;
  require(waitpid(process, &status, 0) == process, "lost the program");
  return WIFSTOPPED(status);
}

}  // namespace

std::set<std::string> environmentVariablesReadBy(const std::vector<std::string>& arguments,
                                                 const std::string& symbols) {
  const std::string path = std::filesystem::canonical(arguments.at(0));
  const std::set<Address> offsets = lookUps(symbols);
  std::vector<char*> argumentVector;
  argumentVector.reserve(arguments.size() + 1);
  for (const std::string& argument : arguments) argumentVector.push_back(const_cast<char*>(argument.c_str()));
  argumentVector.push_back(nullptr);

  const pid_t process = fork();
  require(process >= 0, "cannot fork");
  if (process == 0) {
    const int nowhere = open("/dev/null", O_RDWR);
    if (nowhere < 0) _exit(126);
    dup2(nowhere, STDOUT_FILENO);
    dup2(nowhere, STDERR_FILENO);
    ptrace(PTRACE_TRACEME, 0, nullptr, nullptr);
    execv(path.c_str(), argumentVector.data());
    _exit(127);
  }
  require(waitForStop(process), "the program cannot be traced");
  // If anything fails from here on, this ends the stopped program.
  require(ptrace(PTRACE_SETOPTIONS, process, nullptr, PTRACE_O_EXITKILL) == 0,
          "the program cannot be traced");

  const Address base = loadAddress(process, path);
  std::map<Address, Address> originals;
  const auto setBreakpoint = [&](Address address) {
    writeWord(process, address, (originals[address] & ~kBreakpointMask) | kBreakpoint);
  };
  for (const Address offset : offsets) {
    originals[base + offset] = readWord(process, base + offset);
    setBreakpoint(base + offset);
  }

  std::set<std::string> names;
  while (ptrace(PTRACE_CONT, process, nullptr, nullptr) == 0 && waitForStop(process)) {
    user_regs_struct registers{};
    require(ptrace(PTRACE_GETREGS, process, nullptr, &registers) == 0, "cannot read the registers");
    const auto original = originals.find(registers.rip - 1);
    require(original != originals.end(), "the program stopped where nobody asked it to");
    names.insert(readText(process, registers.rdi));
    // The program executes the original instruction alone. Then the breakpoint is set again.
    registers.rip = original->first;
    writeWord(process, original->first, original->second);
    require(ptrace(PTRACE_SETREGS, process, nullptr, &registers) == 0, "cannot write the registers");
    require(ptrace(PTRACE_SINGLESTEP, process, nullptr, nullptr) == 0 && waitForStop(process),
            "cannot step over a breakpoint");
    setBreakpoint(original->first);
  }
  return names;
}
