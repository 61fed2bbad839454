#!/bin/sh
# The appliance's nginx configuration generator, run by the configuration
# manager under its generation lock. The work is done by tavonginxgen.
exec /usr/tavo/bin/tavonginxgen "$@"
