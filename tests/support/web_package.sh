# shellcheck shell=bash
# For package_test.sh, with its functions: the package of the page, in its root, with Cockpit as it is
# shipped; a login by PAM in a browser, and administrative access there.

: "${here:?the directory of the tests}" "${checkout:?}"
readonly PAGE_PACKAGE=cockpit-zelosched
readonly COCKPIT=(cockpit-ws cockpit-system sudo)
readonly PERSON=maria PASSWORD='a long password'

copy_page() {
  mkdir -p "$ROOT/page"
  cp "$DEBS/${PAGE_PACKAGE}"_[0-9]*.deb "$ROOT/page"
}

install_cockpit() {
  local -a install=(apt-get install -qq -y --no-install-recommends)
  in_root_quietly sh -c "${install[*]} ${COCKPIT[*]} /packages/*.deb" ||
    in_root_quietly sh -c "apt-get update -qq && ${install[*]} ${COCKPIT[*]} /packages/*.deb"
}

install_page() {
  in_root_quietly sh -c 'dpkg -i /page/*.deb'
}

# Of the tree, and the translations that are made from it.
page_files() {
  (cd "$ROOT/usr/share/cockpit/zelosched" && stat -c '%A %U:%G %n' -- *)
}

expected_page_files() {
  (
    cd "$checkout/web" || exit
    { printf '%s\n' ./*.js index.html manifest.json style.css && printf '%s\n' po/*.po; } |
      sed -e 's,^\./,,' -e 's,^po/\(.*\)\.po$,po.\1.js,' -e 's/^/-rw-r--r-- root:root /' | sort -k 3
  )
}

is_described() {
  quietly appstreamcli validate --no-net "$ROOT/usr/share/metainfo/cockpit-zelosched.metainfo.xml"
}

nothing_depends_on_page() {
  ! grep -lE "^(Depends|Recommends|Pre-Depends):.*$PAGE_PACKAGE" <(for deb in "$DEBS"/*.deb; do dpkg-deb -I "$deb"; done)
}

make_person() {
  in_root_quietly useradd --create-home --shell /bin/bash --groups sudo "$PERSON" &&
    in_root_quietly sh -c "echo '$PERSON:$PASSWORD' | chpasswd"
}

# In a browser of the machine, at a cockpit-ws of the root.
log_in() {
  local port status=0
  port=$(/usr/bin/python3 -c 'import socket
with socket.socket() as probe:
    probe.bind(("127.0.0.1", 0))
    print(probe.getsockname()[1])')
  in_root /usr/lib/cockpit/cockpit-ws --no-tls --address 127.0.0.1 --port "$port" >"$WORK/cockpit.log" 2>&1 &
  local server=$!
  quietly timeout 120 /usr/bin/python3 "$here/support/web_login.py" "$port" "$PERSON" "$PASSWORD" || status=$?
  kill "$server"
  wait "$server" 2>/dev/null || true
  return "$status"
}

saved_by_page() {
  same "$(in_root zelosched list --json | grep -o '"name": "Saved in the browser"')" '"name": "Saved in the browser"'
}

page_is_tested() {
  check "the page is a package that no other needs" nothing_depends_on_page
  check "Cockpit is installed, and the others again" install_cockpit
  copy_page
  files_in_root >"$WORK/before_page"
  check "the page is installed" install_page
  check "its files are those of the tree, with the translations" same "$(page_files)" "$(expected_page_files)"
  check "what it tells of itself is in order" is_described
  check "it is installed over itself" install_page
  check "it is removed" in_root_quietly dpkg --remove "$PAGE_PACKAGE"
  check "and has left nothing" same "$(differences_from "$WORK/before_page")" ""
  check "it is installed again" install_page
  check "somebody logs in by PAM, gains administrative access, and adds a task" same "$(make_person && log_in)" ""
  check "the task is there" saved_by_page
}
