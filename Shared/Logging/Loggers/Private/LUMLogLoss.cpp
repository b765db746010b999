#include "Shared/Logging/Loggers/Private/LUMLogLoss.h"

#include <string>
#include <system_error>

#include "Runtime/Objects/String.h"

rt::Ref<LUMLogMessage> LUMLogLossMessage(std::uint64_t count, int error) {
  using namespace rt::literals;
  std::string text = std::to_string(count) + (count == 1 ? " line was lost: " : " lines were lost: ");
  text += std::generic_category().message(error);
  rt::String string = rt::String::fromUTF8Repaired(text);
  return LUMLogMessage::initWithLevel(LUMLogLevelError, string, string, nullptr, nullptr, 0, nullptr, nullptr,
                                      nullptr, nullptr, nullptr);
}
