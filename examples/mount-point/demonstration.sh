#!/usr/bin/env bash
# Shows the life of a directory from the shell: it is made, looked at and removed. Also shows what the command
# answers if there is nothing to do. Works in /Volumes; script/run runs it with a private one.
#
# usage: demonstration.sh MOUNT_POINT
set -uo pipefail
mount_point=$1

show() {
  local output status=0
  output=$("$mount_point" "$@" 2>&1) || status=$?
  echo "\$ mount-point $*"
  [ -z "$output" ] || echo "$output"
  echo "  exit status $status"
}

show Backup
echo "\$ stat /Volumes/Backup"
stat --format '  mode %a, owner %U:%G' /Volumes/Backup
show Backup
show Back/up
show Backup --remove
show Backup --remove
