# Shared by the demo's steps (tools/demo.d/*.sh), which source it.

# Prints the command as one would type it (arguments quoted where needed).
print_command() {
  local arg line=
  for arg in "$@"; do
    if [[ $arg =~ ^[A-Za-z0-9_./:=,+@-]+$ ]]; then
      line+=" $arg"
    else
      line+=" '${arg//\'/\'\\\'\'}'"
    fi
  done
  printf '\n$%s\n' "$line"
}

# Shows a command, then runs it; its failure fails the step.
show() {
  print_command "$@"
  "$@"
}

# Shows a command that may fail on purpose (a refused port, a refused
# setting), then runs it and reports a failure's exit status.
show_any() {
  print_command "$@"
  "$@" || echo "(exit status $?)"
}
