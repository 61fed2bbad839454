#include "appliance_setup.h"

#include <dirent.h>
#include <errno.h>
#include <fcntl.h>
#include <limits.h>
#include <net/if.h>
#include <sys/ioctl.h>
#include <sys/mount.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <utility>

#include "tree_copy.h"

namespace tavow3::sandbox {
namespace {

constexpr const char* kApplianceDirs[] = {
    "/usr/tavo/bin",
    "/usr/tavo/etc/www",
    "/usr/tavo/etc/services.d",
    "/usr/tavo/etc/rc.sysv",
    "/usr/tavo/etc.defaults/www",
    "/usr/tavo/share/nginx",
    "/usr/tavo/share/certificate.d",
    "/usr/local/etc/services.d",
    "/usr/local/etc/nginx/conf.d",
    "/usr/local/etc/nginx/sites-enabled",
    "/var/tmp/nginx",
    "/var/tmp/tavow3",
    "/var/packages",
    "/run/lock",
    "/run/tavow3",
};
// Debian keeps these under /usr/sbin; the appliance runs them from /usr/bin.
constexpr const char* kSbinTools[] = {"nginx", "iptables"};
// The only trees a staged file may land in: all of them are private.
constexpr const char* kStagedTrees[] = {"usr", "etc", "var", "run", "tmp"};
constexpr const char* kOverlaid[] = {"usr", "etc", "var"};
// The scratch (upper layers, /run, /tmp, /dev/shm) is mounted on /tmp until
// /tmp/tmp covers it: no host directory is needed for it.
constexpr char kScratch[] = "/tmp";

struct DeviceNode {
  const char* name;
  unsigned major;
  unsigned minor;
};
constexpr DeviceNode kDevices[] = {{"null", 1, 3},   {"zero", 1, 5},    {"full", 1, 7},
                                   {"random", 1, 8}, {"urandom", 1, 9}, {"tty", 5, 0}};

bool Fail(const std::string& what, const std::string& path) {
  std::fprintf(stderr, "sandbox-init: %s %s: %s\n", what.c_str(), path.c_str(),
               std::strerror(errno));
  return false;
}

bool Mount(const std::string& source, const std::string& target, const char* type,
           unsigned long flags, const std::string& data = "") {
  if (::mount(source.c_str(), target.c_str(), type, flags, data.empty() ? nullptr : data.c_str()) ==
      0) {
    return true;
  }
  return Fail("cannot mount " + source + " on", target);
}

bool MakeDir(const std::string& path, mode_t mode) {
  if (::mkdir(path.c_str(), mode) == 0 || errno == EEXIST) return true;
  return Fail("cannot create", path);
}

bool MakeDirs(const std::string& path, mode_t mode) {
  for (size_t slash = path.find('/', 1); slash != std::string::npos;
       slash = path.find('/', slash + 1)) {
    if (!MakeDir(path.substr(0, slash), mode)) return false;
  }
  return MakeDir(path, mode);
}

bool Symlink(const std::string& target, const std::string& path) {
  if (::symlink(target.c_str(), path.c_str()) == 0) return true;
  return Fail("cannot create", path);
}

bool IsUnder(const std::string& path, const std::string& dir) {
  return path.size() > dir.size() && path.compare(0, dir.size(), dir) == 0 &&
         path[dir.size()] == '/';
}

// In a chroot, / is not a mount point and cannot be made private as it is:
// bind it onto itself and enter the bind ("/.." crosses into a mount stacked
// on the root, "/" does not).
bool MakeMountsPrivate() {
  if (::mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0) return true;
  if (errno != EINVAL) return Fail("cannot make the mounts private under", "/");
  if (!Mount("/", "/", nullptr, MS_BIND | MS_REC)) return false;
  if (::chroot("/..") != 0) return Fail("cannot enter the new root", "/..");
  if (::mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0) return true;
  return Fail("cannot make the mounts private under", "/");
}

bool MakeDeviceNode(const std::string& dev, const DeviceNode& node) {
  std::string path = dev + "/" + node.name;
  std::string host = std::string("/dev/") + node.name;
  struct stat st {};
  if (::stat(host.c_str(), &st) == 0 && S_ISCHR(st.st_mode)) {
    int fd = ::open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0666);
    if (fd < 0) return Fail("cannot create", path);
    ::close(fd);
    return Mount(host, path, nullptr, MS_BIND);
  }
  // A chroot may come without /dev.
  if (::mknod(path.c_str(), S_IFCHR | 0666, makedev(node.major, node.minor)) == 0) return true;
  return Fail("cannot create", path);
}

// Builds /dev on a tmpfs at `dev`, then moves it over /dev: nothing is ever
// created in the host's /dev.
bool ReplaceDev(const std::string& dev, const std::string& shm) {
  if (!MakeDir(dev, 0755) ||
      !Mount("tavow3-dev", dev, "tmpfs", MS_NOSUID | MS_NOEXEC, "mode=0755,size=1m")) {
    return false;
  }
  for (const DeviceNode& node : kDevices) {
    if (!MakeDeviceNode(dev, node)) return false;
  }
  return MakeDir(dev + "/pts", 0755) && MakeDir(dev + "/shm", 0755) &&
         Mount("devpts", dev + "/pts", "devpts", MS_NOSUID | MS_NOEXEC,
               "newinstance,ptmxmode=0666,mode=0620") &&
         Symlink("pts/ptmx", dev + "/ptmx") && Mount(shm, dev + "/shm", nullptr, MS_BIND) &&
         Symlink("/proc/self/fd", dev + "/fd") && Symlink("/proc/self/fd/0", dev + "/stdin") &&
         Symlink("/proc/self/fd/1", dev + "/stdout") &&
         Symlink("/proc/self/fd/2", dev + "/stderr") && Mount(dev, "/dev", nullptr, MS_MOVE);
}

// redirect_dir lets a directory of the lower layer be renamed, as on a plain
// file system (the web-server deployers move such directories to backups).
bool MountOverlays(const std::string& scratch) {
  for (const char* dir : kOverlaid) {
    std::string layer = scratch + "/" + dir;
    if (!MakeDir(layer, 0755) || !MakeDir(layer + "/upper", 0755) ||
        !MakeDir(layer + "/work", 0755) ||
        !Mount(std::string("tavow3-") + dir, std::string("/") + dir, "overlay", 0,
               "lowerdir=/" + std::string(dir) + ",upperdir=" + layer + "/upper,workdir=" + layer +
                   "/work,redirect_dir=on")) {
      return false;
    }
  }
  return true;
}

using KeptDirs = std::vector<std::pair<std::string, int>>;

// Opens the host directories of `wanted` and the working directory `cwd` that
// lie under /tmp or /run (outermost ones only), before anything covers them.
bool OpenVisible(const std::vector<std::string>& wanted, const std::string& cwd, KeptDirs* kept) {
  std::vector<std::string> visible = {cwd};
  for (const std::string& path : wanted) {
    char resolved[PATH_MAX];
    if (::realpath(path.c_str(), resolved) != nullptr) visible.push_back(resolved);
  }
  std::sort(visible.begin(), visible.end());
  for (const std::string& path : visible) {
    if (!IsUnder(path, "/tmp") && !IsUnder(path, "/run")) continue;
    if (!kept->empty() && (path == kept->back().first || IsUnder(path, kept->back().first))) {
      continue;
    }
    int fd = ::open(path.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC);
    if (fd < 0) return Fail("cannot open", path);
    kept->emplace_back(path, fd);
  }
  return true;
}

// Replaces /run and /tmp with directories of the scratch, then puts the kept
// host directories back at their paths.
bool ReplaceRunAndTmp(const std::string& scratch, const KeptDirs& kept) {
  bool ok = MakeDir(scratch + "/run", 0755) && MakeDir(scratch + "/tmp", 01777) &&
            Mount(scratch + "/run", "/run", nullptr, MS_BIND) &&
            Mount(scratch + "/tmp", "/tmp", nullptr, MS_BIND);
  for (const auto& [path, fd] : kept) {
    ok = ok && MakeDirs(path, 0755) &&
         Mount("/proc/self/fd/" + std::to_string(fd), path, nullptr, MS_BIND | MS_REC);
  }
  return ok;
}

bool LinkSbinTools() {
  for (const char* tool : kSbinTools) {
    std::string link = std::string("/usr/bin/") + tool;
    std::string target = std::string("/usr/sbin/") + tool;
    struct stat st {};
    if (::lstat(link.c_str(), &st) == 0 || ::stat(target.c_str(), &st) != 0) continue;
    if (!Symlink(target, link)) return false;
  }
  return true;
}

bool BringLoopbackUp() {
  int fd = ::socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
  if (fd < 0) return Fail("cannot open a socket for", "lo");
  ifreq request{};
  std::strncpy(request.ifr_name, "lo", IFNAMSIZ - 1);
  bool ok = ::ioctl(fd, SIOCGIFFLAGS, &request) == 0;
  request.ifr_flags |= IFF_UP | IFF_RUNNING;
  ok = ok && ::ioctl(fd, SIOCSIFFLAGS, &request) == 0;
  if (!ok) Fail("cannot bring up", "lo");
  ::close(fd);
  return ok;
}

bool StageTree(int root_fd, const std::string& root) {
  int list_fd = ::dup(root_fd);  // fdopendir takes the descriptor over
  DIR* dir = list_fd >= 0 ? ::fdopendir(list_fd) : nullptr;
  if (dir == nullptr) return Fail("cannot list", root);
  bool ok = true;
  while (dirent* entry = ok ? ::readdir(dir) : nullptr) {
    std::string name = entry->d_name;
    if (name == "." || name == "..") continue;
    if (std::find(std::begin(kStagedTrees), std::end(kStagedTrees), name) ==
        std::end(kStagedTrees)) {
      std::fprintf(stderr,
                   "sandbox-init: cannot stage %s/%s: only usr, etc, var, run and tmp "
                   "are private to the sandbox\n",
                   root.c_str(), name.c_str());
      ok = false;
      break;
    }
    int tree = ::openat(root_fd, name.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC | O_NOFOLLOW);
    if (tree < 0) {
      ok = Fail("cannot open", root + "/" + name);
      break;
    }
    ok = CopyTree(tree, "/" + name);
    ::close(tree);
  }
  ::closedir(dir);
  return ok;
}

}  // namespace

bool SetUpAppliance(const SetupOptions& options) {
  char cwd[PATH_MAX];
  if (::getcwd(cwd, sizeof cwd) == nullptr) return Fail("cannot read the working directory", "");
  // Opened before anything covers it: the tree may lie under /tmp.
  int root_fd = ::open(options.root.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (root_fd < 0) return Fail("cannot open", options.root);
  const std::string scratch = kScratch;
  const mode_t saved_umask = ::umask(0);  // directory modes such as 01777 as written
  KeptDirs kept;
  struct stat st {};
  bool ok = OpenVisible(options.visible, cwd, &kept) && MakeMountsPrivate();
  if (ok && ::stat("/proc", &st) != 0) ok = Fail("missing mount point", "/proc");
  ok = ok && Mount("proc", "/proc", "proc", MS_NOSUID | MS_NODEV | MS_NOEXEC);
  if (ok && ::stat(kScratch, &st) != 0) ok = Fail("missing mount point", kScratch);
  if (ok) {
    ok = options.keep_dir.empty() ? Mount("tavow3-sandbox", scratch, "tmpfs", 0, "mode=0700")
                                  : Mount(options.keep_dir, scratch, nullptr, MS_BIND);
  }
  ok = ok && MountOverlays(scratch) && MakeDir(scratch + "/shm", 01777) &&
       ReplaceDev(scratch + "/dev", scratch + "/shm") && ReplaceRunAndTmp(scratch, kept);
  for (const char* dir : kApplianceDirs) ok = ok && MakeDirs(dir, 0755);
  ok = ok && LinkSbinTools() && BringLoopbackUp() && StageTree(root_fd, options.root);
  for (const auto& entry : kept) ::close(entry.second);
  ::close(root_fd);
  ::umask(saved_umask);
  if (!ok) return false;
  // Back to the working directory as seen inside, so that relative paths land
  // in the appliance's trees rather than in the host directories they cover.
  if (::chdir(cwd) != 0) {
    std::fprintf(stderr, "sandbox-init: %s is not in the sandbox; starting in /\n", cwd);
    if (::chdir("/") != 0) return Fail("cannot enter", "/");
  }
  return true;
}

}  // namespace tavow3::sandbox
