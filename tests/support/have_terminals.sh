# shellcheck shell=bash
# For scripts that open terminals in the sandbox: a plain chroot has none.
if [[ ! -e /dev/pts/ptmx ]]; then
  mount -n -t devpts -o newinstance,ptmxmode=0666 devpts /dev/pts
fi
