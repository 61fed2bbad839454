/* tavow3-fwregen: regenerates the library's firewall service file
 * "/usr/tavo/etc/services.d/tavow3.sc" from the settings as stored, through
 * the engine's C interface. Exit status 0 on success (also when no settings
 * object declares a port, which removes the file), 1 on failure, whose cause
 * is in the system log; 2 for arguments. */
#include <stdio.h>

#include <tavow3/engine_c.h>

int main(int argc, char** argv) {
  if (argc != 1) {
    fprintf(stderr, "usage: %s\n", argv[0]);
    return 2;
  }
  if (TAVOW3_Fw_RegenAll() != 1) {
    fprintf(stderr, "tavow3-fwregen: regeneration failed (see the system log)\n");
    return 1;
  }
  return 0;
}
