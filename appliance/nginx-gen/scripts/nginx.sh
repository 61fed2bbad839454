#!/bin/sh
# Control script of the web server, run by the platform's service control:
#
#   nginx.sh start|stop|reload|status
#
# start   decides the configuration mode (tavow3-nginxconf 0: Normal, or
#         Default with the management ports opened in the firewall) and
#         starts nginx: Normal from /etc/nginx/nginx.conf, Default (and any
#         failure) from the management-only configuration, so that the
#         management ports 5000 and 5001 answer whatever broke.
# reload  re-deploys (tavow3-nginxconf 1: Normal, else Abnormal; Default
#         stays) and sends SIGHUP to the master process. Exit 0 whenever
#         nginx was signalled.
# stop    stops nginx gracefully (SIGQUIT), forcefully after 10 seconds.
# status  exit 0 while nginx runs, 3 when it does not.
#
# Exit status 0 on success, 1 on failure, 2 for a wrong verb, 7 for a reload
# while nginx does not run.

NGINX=/usr/bin/nginx
NGINXCONF=/usr/tavo/bin/tavow3-nginxconf
GENERATOR=/usr/tavo/bin/tavonginxgen
NORMAL_CONF=/etc/nginx/nginx.conf
DEFAULT_CONF=/usr/tavo/share/nginx/default.conf
PID_FILE=/run/nginx.pid

# Whether process $1 exists and has not exited (a zombie has).
is_alive() {
    [ -r "/proc/$1/stat" ] || return 1
    state=$(sed 's/.*) \(.\).*/\1/' "/proc/$1/stat" 2>/dev/null) || return 1
    [ "$state" != Z ] && [ "$state" != X ]
}

# Prints the pid of the running master process; fails when there is none.
master_pid() {
    pid=
    [ -r "$PID_FILE" ] && read -r pid <"$PID_FILE"
    case $pid in '' | *[!0-9]*) return 1 ;; esac
    is_alive "$pid" || return 1
    echo "$pid"
}

# nginx writes its pid file once it has become a daemon: waits up to 10 s.
wait_for_master() {
    tries=100
    while ! master_pid >/dev/null; do
        tries=$((tries - 1))
        [ "$tries" -gt 0 ] || return 1
        sleep 0.1
    done
}

start_with() {
    "$NGINX" -c "$1" && wait_for_master
}

do_start() {
    if pid=$(master_pid); then
        echo "nginx is already running (pid $pid)"
        return 0
    fi
    "$GENERATOR" --certificate || echo "nginx.sh: the HTTPS ports have no certificate" >&2
    "$NGINXCONF" 0
    mode=$?
    if [ "$mode" -eq 0 ]; then
        start_with "$NORMAL_CONF" && return 0
        echo "nginx.sh: nginx did not start in Normal mode; starting the management ports only" >&2
        start_with "$DEFAULT_CONF"
        return 1
    fi
    [ "$mode" -eq 2 ] || echo "nginx.sh: no mode was decided; starting the management ports only" >&2
    start_with "$DEFAULT_CONF"
}

do_reload() {
    if ! pid=$(master_pid); then
        echo "nginx.sh: nginx is not running" >&2
        return 7
    fi
    # Prints the mode; a failure leaves the files as they were.
    "$NGINXCONF" 1
    kill -HUP "$pid"
}

# Waits up to 10 s for process $1 to end.
wait_for_exit() {
    tries=100
    while is_alive "$1"; do
        tries=$((tries - 1))
        [ "$tries" -gt 0 ] || return 1
        sleep 0.1
    done
}

do_stop() {
    pid=$(master_pid) || return 0
    for signal in QUIT TERM KILL; do
        kill -"$signal" "$pid" 2>/dev/null
        wait_for_exit "$pid" && return 0
    done
    return 1
}

do_status() {
    if pid=$(master_pid); then
        echo "nginx is running (pid $pid)"
        "$NGINXCONF" 5
        return 0
    fi
    echo "nginx is not running"
    return 3
}

case ${1-} in
    start) do_start ;;
    stop) do_stop ;;
    reload) do_reload ;;
    status) do_status ;;
    *)
        echo "usage: nginx.sh start|stop|reload|status" >&2
        exit 2
        ;;
esac
