"""What the stories of the page stand on: zelosched, cockpit-ws and a browser, each the real one.

For a program that is run in the sandbox. The page is the one of the checkout, or what WEB_PAGE names.
"""

import json
import os
import re
import shutil
import socket
import subprocess
import tempfile
import time

from selenium import webdriver
from selenium.webdriver import ActionChains
from selenium.common.exceptions import (ElementClickInterceptedException, NoSuchElementException,
                                        StaleElementReferenceException, TimeoutException,
                                        WebDriverException)
from selenium.webdriver.chrome.service import Service
from selenium.webdriver.common.by import By
from selenium.webdriver.common.keys import Keys

HERE = os.path.dirname(os.path.realpath(__file__))
ROOT = os.path.dirname(os.path.dirname(HERE))
BUILD = os.environ["BUILD_DIR"]
PAGE = os.environ.get("WEB_PAGE", os.path.join(BUILD, "share/cockpit/zelosched"))
WORK = "/run/web_test"
PATIENCE = 15  # seconds; a machine with other work to do is slow

assert os.environ.get("ZELO_SANDBOX"), "run it in the sandbox"


def wait_for(what, condition, patience=PATIENCE):
    """The first true value of condition(); what is looked at may still be changing."""
    end = time.monotonic() + patience
    last = None
    while True:
        try:
            last = condition()
            if last:
                return last
        except (NoSuchElementException, StaleElementReferenceException, ElementClickInterceptedException) as error:
            last = error
        if time.monotonic() > end:
            raise AssertionError(f"not within {patience} s: {what} (last: {last!r})")
        time.sleep(0.02)


def same(got, wanted):
    if got != wanted:
        raise AssertionError(f"\nwanted: {wanted!r}\ngot:    {got!r}")


# ---- the tool -------------------------------------------------------------------------------


def library(commands):
    """Commands of the shell, with the functions of zelosched_test.sh."""
    script = f'. "{HERE}/zelosched_test.sh"\n{commands}'
    return subprocess.run(["bash", "-c", script], check=True, text=True, stdout=subprocess.PIPE).stdout


def z(*words, stdin=None):
    """What zelosched prints; it must succeed."""
    done = subprocess.run([BUILD + "/bin/zelosched", *words], input=stdin, text=True, stdout=subprocess.PIPE,
                          stderr=subprocess.PIPE, check=False)
    if done.returncode != 0:
        raise AssertionError(f"zelosched {words}: {done.returncode}: {done.stderr}")
    return done.stdout


def tasks():
    return json.loads(z("list", "--all", "--json"))["tasks"]


def task(name):
    found = [one for one in tasks() if one["name"] == name]
    same(len(found), 1)
    return found[0]


def power_times():
    return json.loads(z("power", "list", "--json"))["power_times"]


def runs(name):
    return json.loads(z("history", "--task", str(task(name)["id"]), "--json"))["runs"]


def add(*words, command="true"):
    return int(z("add", "--quiet", *words, "--", command))


def older_runs(name, count, ago):
    """The last run of the task so often once more in the history, each that many seconds older."""
    library(f"""sql $KEPT "WITH RECURSIVE n(i) AS (SELECT 1 UNION ALL SELECT i + 1 FROM n WHERE i < {count})
        INSERT INTO run(task, generation, task_name, app, owner, started_by, queued, start, ended, duration, state,
          outcome, exit_code, output_bytes, moment, boot, pid, told)
        SELECT task, generation, task_name, app, owner, started_by, queued - i * {ago}, start - i * {ago},
          ended - i * {ago}, duration, state, outcome, exit_code, output_bytes, moment - i * {ago}, boot, pid, told
        FROM n, (SELECT * FROM run WHERE task_name = '{name}' ORDER BY run DESC LIMIT 1)" """)


def clean():
    library("clean; rm -rf /etc/zelosched /etc/default/zelosched-mail; mkdir -p /etc/zelosched/run-ended.d")
    shutil.copy(ROOT + "/packaging/zelo_poweroff_feasible_check", "/usr/zelo/bin")
    shutil.copy(BUILD + "/bin/zeloschedtask", "/tmp/zeloschedtask")


def thousand_tasks():
    """Written into the store as it is, since adding them takes half a minute."""
    add("--daily", "08:30", "--name", "NAME", "--app", "APP", command="COMMAND")
    with open("/tmp/scheduled_tasks", encoding="utf-8") as file:
        keys = [line for line in file.read().splitlines() if "=" in line and not line.startswith("#")]
    lines = []
    for i in range(1, 1001):
        new = {"id": i, "name": f"Task {i} of {('photos', 'mail', 'music')[i % 3]}", "app": f"app{i % 20}",
               "run hour": i % 24, "run min": i % 60}
        lines.append(f"[{i}]")
        lines += [f'{key}="{new[key]}"' if key in new else line
                  for line in keys for key in [line.split("=")[0]]]
    for path in ("/tmp/scheduled_tasks", "/usr/zelo/etc/scheduled_tasks", "/usr/zelo/etc/scheduled_tasks.last-good"):
        with open(path, "w", encoding="utf-8") as file:
            file.write("\n".join(lines) + "\n")
    z("sync")


def zone_where_it_is(hour):
    """So that what a story sees does not depend on the time of day at which it is told."""
    east = (hour - time.gmtime().tm_hour + 12) % 24 - 12
    return f"Etc/GMT{-east:+d}"  # whose sign is the one of POSIX


def set_zone(browser, name):
    """The machine's and the browser's."""
    subprocess.run(["ln", "-sf", "/usr/share/zoneinfo/" + name, "/etc/localtime"], check=True)
    time.tzset()
    browser.zone(name)


# ---- cockpit --------------------------------------------------------------------------------


def free_port():
    with socket.socket() as probe:
        probe.bind(("127.0.0.1", 0))
        return probe.getsockname()[1]


def is_listening(port):
    with socket.socket() as probe:
        return probe.connect_ex(("127.0.0.1", port)) == 0


class Server:
    """cockpit-ws with a session of root, or of another user; each call of zelosched is counted."""

    def __init__(self, user=None):
        self.port = free_port()
        self.calls_file = os.path.join(WORK, f"calls.{self.port}")
        share = os.path.join(WORK, f"share.{self.port}")
        os.makedirs(os.path.join(share, "cockpit"))
        shutil.copytree(PAGE, os.path.join(share, "cockpit/zelosched"))
        tools = os.path.join(WORK, f"bin.{self.port}")
        os.makedirs(tools)
        program = BUILD + "/bin/zelosched"
        if user:
            library("copy_for_others")
            program = "/run/for_others/zelosched"
        self.broken_file = os.path.join(WORK, f"broken.{self.port}")
        self.write(os.path.join(tools, "zelosched"),
                   f'#!/bin/sh\necho "$@" >>{self.calls_file}\n'
                   f'if [ -e {self.broken_file} ] && grep -qx "$1" {self.broken_file}; then\n'
                   f'  tail -n 1 {self.broken_file} >&2\n  exit 1\nfi\nexec {program} "$@"\n')
        session = os.path.join(tools, "session")
        become = f"setpriv --reuid={user} --regid=65534 --clear-groups " if user else ""
        self.write(session, f"#!/bin/sh\nexec {become}cockpit-bridge\n")
        self.environment = dict(os.environ, PATH=tools + ":" + os.environ["PATH"], HOME=WORK, LANG="C.UTF-8",
                           XDG_DATA_DIRS=share + ":/usr/share", XDG_DATA_HOME=WORK + "/none", XDG_RUNTIME_DIR=WORK)
        self.session = session
        self.process = None
        self.url = f"http://127.0.0.1:{self.port}/cockpit/@localhost/zelosched/index.html"
        self.start()

    def start(self):
        """Anew: a session that nobody uses for a while ends, and with it the server's only one."""
        if os.path.exists(self.broken_file):
            os.remove(self.broken_file)
        with open(self.calls_file, "w", encoding="utf-8"):
            os.chmod(self.calls_file, 0o666)
        self.new_session()

    def new_session(self):
        self.stop()
        with open(os.path.join(WORK, f"ws.{self.port}.log"), "w", encoding="utf-8") as log:
            self.process = subprocess.Popen(
                ["/usr/lib/cockpit/cockpit-ws", "--no-tls", "--address", "127.0.0.1", "--port", str(self.port),
                 "--local-session=" + self.session], env=self.environment, stdout=log, stderr=log)
        wait_for("cockpit-ws listens", lambda: is_listening(self.port))

    @staticmethod
    def write(path, text):
        with open(path, "w", encoding="utf-8") as file:
            file.write(text)
        os.chmod(path, 0o755)

    def calls(self):
        with open(self.calls_file, encoding="utf-8") as file:
            return file.read().splitlines()

    def break_tool(self, *commands, saying="cannot do that"):
        """These commands of it fail from now on; without any, none does."""
        if commands:
            with open(self.broken_file, "w", encoding="utf-8") as file:
                file.write("\n".join([*commands, "zelosched: " + saying]) + "\n")
        elif os.path.exists(self.broken_file):
            os.remove(self.broken_file)
        library("touch $STORE")

    def stop(self):
        if self.process:
            self.process.terminate()
            self.process.wait()
        self.process = None


# ---- the browser ----------------------------------------------------------------------------


class Browser:
    def __init__(self):
        options = webdriver.ChromeOptions()
        options.binary_location = "/usr/bin/chromium"
        for word in ("--headless=new", "--no-sandbox", "--disable-gpu", "--disable-dev-shm-usage", "--lang=en",
                     "--no-first-run", "--disable-background-networking", "--disable-component-update",
                     "--disable-extensions", "--user-data-dir=" + tempfile.mkdtemp(dir=WORK)):
            options.add_argument(word)
        options.set_capability("goog:loggingPrefs", {"browser": "ALL"})
        self.driver = webdriver.Chrome(options=options, service=Service("/usr/bin/chromedriver"))
        self.driver.set_script_timeout(PATIENCE)
        self.driver.set_page_load_timeout(PATIENCE)
        self.size(1280, 900)

    def quit(self):
        self.driver.quit()

    def size(self, width, height):
        """Of the page, which may be narrower than any window."""
        self.driver.execute_cdp_cmd("Emulation.setDeviceMetricsOverride",
                                    {"width": width, "height": height, "deviceScaleFactor": 1, "mobile": False})

    def double_click(self, element):
        ActionChains(self.driver).double_click(element).perform()

    def zone(self, name):
        self.driver.execute_cdp_cmd("Emulation.setTimezoneOverride", {"timezoneId": name})

    def dark(self, is_dark):
        self.driver.execute_cdp_cmd("Emulation.setEmulatedMedia", {"features": [
            {"name": "prefers-color-scheme", "value": "dark" if is_dark else "light"}]})

    def open(self, server, path=""):
        """Loaded anew, also where only what follows the # differs."""
        self.driver.get("about:blank")
        try:
            self.driver.get(server.url + "#/" + path)
        except TimeoutException:  # Chromium's renderer now and then never begins; the page is not to blame
            self.driver.execute_cdp_cmd("Network.clearBrowserCookies", {})
            server.new_session()  # nobody was there, and the session has ended
            self.driver.get(server.url + "#/" + path)
        wait_for("the page is there", lambda: self.find("nav a"))

    def script(self, text, *arguments):
        return self.driver.execute_script(text, *arguments)

    def find(self, selector):
        return self.driver.find_element(By.CSS_SELECTOR, selector)

    def all(self, selector):
        return self.driver.find_elements(By.CSS_SELECTOR, selector)

    # In the browser, since a call for each element takes its time.
    def shown(self, selector):
        return self.script("""return [...document.querySelectorAll(arguments[0])]
            .filter((one) => one.checkVisibility({checkVisibilityCSS: true}))""", selector)

    def text(self, selector="main"):
        return self.script("const found = document.querySelector(arguments[0]); return found ? found.innerText : ''",
                           selector)

    def see(self, text, selector="body"):
        """Waits until the text is shown there."""
        wait_for(f"{text!r} in {selector}: {self.text(selector)[:2000]!r}", lambda: text in self.text(selector))

    def see_not(self, text, selector="body"):
        wait_for(f"no {text!r} in {selector}", lambda: text not in self.text(selector))

    def named(self, name, tags="button, a, summary"):
        """What is shown and has that text or label."""
        found = self.script("""return [...document.querySelectorAll(arguments[1])].find((one) =>
            one.checkVisibility({checkVisibilityCSS: true}) &&
            [one.innerText.trim(), one.getAttribute("aria-label")].includes(arguments[0]))""", name, tags)
        if not found:
            raise NoSuchElementException(name)
        return found

    def click(self, name, tags="button, a, summary"):
        wait_for(f"{name!r} can be clicked", lambda: self.named(name, tags).click() or True)

    def dialog(self, name):
        """A button of the dialog that is open."""
        self.click(name, "dialog button")

    def field(self, label):
        """The field of that label."""
        return wait_for(f"field {label!r}", lambda: self.script("""
            const found = [...document.querySelectorAll("label, .label")].find((one) =>
              one.checkVisibility({checkVisibilityCSS: true}) && one.innerText.trim() === arguments[0]);
            return found && (found.htmlFor ? document.getElementById(found.htmlFor) : found.querySelector("input"))""", label))

    def write(self, label, text):
        field = self.field(label)
        field.send_keys(Keys.CONTROL, "a")
        field.send_keys(Keys.DELETE)
        field.send_keys(text)

    def set(self, field, value):
        """As a browser's own pickers do, whose keys depend on its language."""
        self.script("""const [field, value] = arguments; field.focus(); field.value = value;
            for (const name of ["input", "change"]) field.dispatchEvent(new Event(name, {bubbles: true}))""", field, value)

    def choose(self, label, value):
        self.set(self.field(label), value)

    def keys(self, *keys):
        self.driver.switch_to.active_element.send_keys(*keys)

    def see_focused(self, what, condition):
        """Waits until what has the focus is like that."""
        wait_for(f"{what} has the focus", lambda: condition(self.focused()))

    def focused(self):
        return self.driver.switch_to.active_element

    def errors(self):
        """What the browser complains of since the last time."""
        return [f"{entry['level']}: {entry['message']}" for entry in self.driver.get_log("browser")
                if entry["level"] in ("SEVERE", "WARNING") and "favicon.ico" not in entry["message"]]

    def picture(self, path):
        self.driver.save_screenshot(path)


def column(browser, name):
    """The texts of a column of the table of tasks, in their order."""
    return browser.script("""return [...document.querySelectorAll("tbody tr td.c-" + arguments[0])]
        .map((cell) => cell.innerText.trim())""", name)


def numbers(text):
    return [int(number) for number in re.findall(r"\d+", text)]


__all__ = [name for name in dir() if not name.startswith("_")]
