// The caller of a set-user-ID process may stop it between `mkdir` and `chown`. Meanwhile the name may become
// another user's directory, a mounted volume or a symbolic link of root's. A command with all of root's
// rights would give any of these to the caller.
//
// So the process takes on its caller's identity before it touches a name. The new directory then belongs to
// the caller from its first moment, and `chown` has no right to give away anything else. CAP_DAC_OVERRIDE
// stays, because the command has to write in root's /Volumes.
//
// Every process with CAP_CHOWN takes on the identity, also when its caller is root. Otherwise root could be
// made to take what somebody puts in the place of its directory. A process without CAP_CHOWN cannot give
// anything away.

#include "tool/CallerIdentity.h"

#include <linux/capability.h>
#include <sys/fsuid.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <array>

namespace {

// A capability is one bit of two words. Both capabilities below are in the first word.
using Capabilities = std::array<__user_cap_data_struct, _LINUX_CAPABILITY_U32S_3>;
constexpr __u32 kOverride = 1U << CAP_DAC_OVERRIDE;
constexpr __u32 kGiveAway = 1U << CAP_CHOWN;

// Calls SYS_capget or SYS_capset for this thread. The C library has no functions for them.
bool callWith(long call, Capabilities& capabilities) {
  __user_cap_header_struct header{_LINUX_CAPABILITY_VERSION_3, 0};
  return syscall(call, &header, capabilities.data()) == 0;
}

}  // namespace

void takeOnCallersIdentity() {
  Capabilities capabilities{};
  if (!callWith(SYS_capget, capabilities) || (capabilities[0].effective & kGiveAway) == 0) return;

  const gid_t group = getgid();
  const uid_t user = getuid();
  const auto formerGroup = static_cast<gid_t>(setfsgid(group));
  const auto formerUser = static_cast<uid_t>(setfsuid(user));
  // Both calls return the previous identifier, so only a second call shows whether the first one worked.
  const bool isCaller =
      static_cast<gid_t>(setfsgid(group)) == group && static_cast<uid_t>(setfsuid(user)) == user;
  // Giving up the user root removed CAP_DAC_OVERRIDE from the effective set. This call restores it, or fails
  // if the capability is not permitted.
  capabilities = {};
  capabilities[0].effective = capabilities[0].permitted = kOverride;
  if (isCaller && callWith(SYS_capset, capabilities)) return;

  // Half an identity would be denied what both the old and the new one allow. Returning to root restores the
  // capabilities.
  setfsuid(formerUser);
  setfsgid(formerGroup);
}
