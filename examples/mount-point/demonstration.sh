#!/usr/bin/env bash
# A directory's life, from the shell: made, looked at, and removed, with what the command answers when
# there is nothing to do. Works in /Volumes; script/run runs it in a private one.
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
