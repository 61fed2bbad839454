#!/bin/bash
# Runs tools/check-raw-calls on a small tree with known offences and known
# look-alikes, and checks that it reports exactly the offences.
set -euo pipefail

script=$1
tree=$(mktemp -d)
trap 'rm -rf "$tree"' EXIT
mkdir -p "$tree/src/base" "$tree/src/engine"

# Wrappers may make raw calls.
cat > "$tree/src/base/file_io.cc" <<'CODE'
int Open(const char* p) { return ::open(p, 0); }
CODE

cat > "$tree/src/engine/clean.cc" <<'CODE'
// Comments may say open(2), rename() or fork( freely.
/* So may block comments: close(fd);
   unlink(path); */
const char* kMessage = "cannot open(%s): rename( failed";
const char kQuote = '"';
const char* kRaw = R"(system("ls"))";
bool Save() {
  UniqueFd fd = base::Open(path, O_RDONLY);
  writer->write(root, &out);
  Json::FastWriter().write(root);
  std::istringstream input(text);
  struct stat st;
  base::Stat(path, &st);
  Json::writeString(builder, root);
  std::this_thread::sleep_for(delay);
  if (pid == 0) base::Exit(0);
  return TLIBCExec(argv) == 0 && reopen(x) && base::ReadFile(path, &text);
}
CODE

cat > "$tree/src/engine/bad.cc" <<'CODE'
#include <fstream>
int a = ::open(path, O_RDONLY);
if (read(fd, buf, n) < 0) return;
std::system("x");
pid_t pid = fork();
(void)execv(argv[0], argv);
ok = !stat(path, &st);
int x = 1;  // "quoted" then close(fd) in a comment
popen ("nginx -t", "r");
if (pid == 0) _exit(127);
CODE

expected="src/engine/bad.cc:1: raw <fstream>: #include <fstream>
src/engine/bad.cc:2: raw open(): int a = ::open(path, O_RDONLY);
src/engine/bad.cc:3: raw read(): if (read(fd, buf, n) < 0) return;
src/engine/bad.cc:4: raw system(): std::system(\"x\");
src/engine/bad.cc:5: raw fork(): pid_t pid = fork();
src/engine/bad.cc:6: raw execv(): (void)execv(argv[0], argv);
src/engine/bad.cc:7: raw stat(): ok = !stat(path, &st);
src/engine/bad.cc:9: raw popen(): popen (\"nginx -t\", \"r\");
src/engine/bad.cc:10: raw _exit(): if (pid == 0) _exit(127);"

status=0
actual=$("$script" "$tree") || status=$?
if [[ $status -ne 1 || "$actual" != "$expected" ]]; then
  echo "offending tree: exit $status, output:"
  echo "$actual"
  echo "expected exit 1 and:"
  echo "$expected"
  exit 1
fi

rm "$tree/src/engine/bad.cc"
status=0
actual=$("$script" "$tree") || status=$?
if [[ $status -ne 0 || -n "$actual" ]]; then
  echo "clean tree: exit $status, output:"
  echo "$actual"
  exit 1
fi
echo "check-raw-calls: offences found, look-alikes ignored"
