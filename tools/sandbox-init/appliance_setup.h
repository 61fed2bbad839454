// Turns a fresh mount and network namespace into a throwaway appliance.
#ifndef TAVOW3_TOOLS_SANDBOX_INIT_APPLIANCE_SETUP_H_
#define TAVOW3_TOOLS_SANDBOX_INIT_APPLIANCE_SETUP_H_

#include <string>
#include <vector>

namespace tavow3::sandbox {

struct SetupOptions {
  std::string root;  // the staged tree copied over /
  // A host directory that receives the scratch (the overlays' upper layers,
  // /run, /tmp, /dev/shm) and keeps it after the run. When empty, the scratch
  // is a tmpfs that vanishes with the mount namespace.
  std::string keep_dir;
  // Host directories (the build, the sources, the command's) that stay visible
  // at their real paths when they lie under /tmp or /run, which the sandbox
  // replaces; the working directory always does. Missing ones are ignored.
  std::vector<std::string> visible;
};

// Must run as PID 1 of new PID, mount and network namespaces. Makes every
// mount private (making / a mount point first when it is not one, as in a
// chroot), mounts a fresh /proc, overlays /usr, /etc and /var, replaces
// /dev, /dev/shm, /run and /tmp,
// creates the appliance's directories and the /usr/bin links to nginx and
// iptables, brings loopback up, copies options.root over / and returns to the
// working directory. Returns false with a message on stderr.
bool SetUpAppliance(const SetupOptions& options);

}  // namespace tavow3::sandbox

#endif  // TAVOW3_TOOLS_SANDBOX_INIT_APPLIANCE_SETUP_H_
