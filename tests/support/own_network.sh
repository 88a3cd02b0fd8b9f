# shellcheck shell=bash
# For test scripts that listen: begins the script anew in a network of its own, with all of the loopback
# addresses, so that nobody else's ports are in the way and nobody else reaches it.
if [[ -z ${ZELO_OWN_NETWORK:-} ]]; then
  export ZELO_OWN_NETWORK=1
  exec unshare --net "$0" "$@"
fi
python3 - <<'PY'
import fcntl, socket, struct
SIOCGIFFLAGS, SIOCSIFFLAGS, IFF_UP = 0x8913, 0x8914, 1
with socket.socket(socket.AF_INET, socket.SOCK_DGRAM) as any_socket:
    name, flags = struct.unpack("16sH", fcntl.ioctl(any_socket, SIOCGIFFLAGS, struct.pack("16sH14x", b"lo", 0))[:18])
    fcntl.ioctl(any_socket, SIOCSIFFLAGS, struct.pack("16sH14x", b"lo", flags | IFF_UP))
PY
