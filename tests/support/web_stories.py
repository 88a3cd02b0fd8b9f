#!/usr/bin/python3
"""web_stories.py [NAME...]: stories of people who use the page, each as it is told by its sentence.

What they stand on is in web_machine.py. WEB_PICTURES names a directory for pictures of the views.
"""

import os
import sys
import time
import traceback

from web_machine import *  # pylint: disable=wildcard-import,unused-wildcard-import

STORIES = []


def story(sentence):
    def keep(function):
        STORIES.append((sentence, function))
        return function
    return keep


# ---- health and tasks -----------------------------------------------------------------------


@story("without a task the page invites to the first one, and all is well")
def first_task(browser, server):
    browser.open(server.url)
    browser.see("There is no task yet")
    browser.see("All is well", ".health")
    browser.click("Add the first task")
    browser.see("It would run")
    same(tasks(), [])


@story("tasks are listed with schedule, next and last run, owner and switch")
def listed(browser, server):
    add("--daily", "02:30", "--name", "Nightly backup", "--owner", "nobody", "--app", "backup")
    add("--weekly", "mon-fri", "08:15", "--every", "2h", "--until", "18", "--name", "Mail")
    add("--monthly", "31", "06:00", "--name", "Report", "--disabled")
    z("run", "Mail", "--wait")
    browser.open(server.url)
    browser.see("3 tasks")
    same(sorted(column(browser, "name")), ["Mail", "Nightly backup\nbackup", "Report"])
    text = browser.text("tbody")
    for part in ("Every day at 02:30", "Monday to Friday at 08:15, then every 2 hours until 18:15",
                 "On day 31 of every month at 06:00", "nobody", "finished", "has not run yet", "switched off", "in "):
        assert part in text, (part, text)
    switches = browser.all("tbody input[role=switch]")
    same(sorted(one.is_selected() for one in switches), [False, True, True])


@story("a switch on the list switches the task")
def switched(browser, server):
    add("--daily", "02:30", "--name", "Nightly backup")
    browser.open(server.url)
    browser.see("Nightly backup")
    switch = browser.find("tbody input[role=switch]")
    switch.click()
    wait_for("it is off", lambda: not task("Nightly backup")["enabled"])
    browser.see("switched off", "tbody")
    browser.find("tbody input[role=switch]").click()
    wait_for("it is on", lambda: task("Nightly backup")["enabled"])


@story("health tells what is wrong, worst first, with what helps")
def unwell(browser, server):
    add("--daily", "02:30", "--name", "Backup", command="echo no space left; exit 3")
    subprocess.run([BUILD + "/bin/zelosched", "run", "Backup", "--wait"], check=False, stdout=subprocess.DEVNULL,
                   stderr=subprocess.DEVNULL)
    os.rename("/var/run/crond.pid", "/var/run/crond.pid.kept")
    browser.open(server.url)
    browser.see("2 things need attention", ".health")
    rows = [one.text for one in browser.all(".findings li")]
    assert "Cron is not running" in rows[0] and "Critical" in rows[0], rows
    assert "Start cron in Services" in rows[0], rows
    assert "Backup failed with code 3, just now" in rows[1], rows
    browser.click("Show the run")
    browser.see("no space left", ".output")
    os.rename("/var/run/crond.pid.kept", "/var/run/crond.pid")
    browser.open(server.url)
    browser.click("Take note")
    browser.see("All is well", ".health")


# ---- running them ---------------------------------------------------------------------------


def picked():
    wanted = sys.argv[1:]
    return [(sentence, function) for sentence, function in STORIES if not wanted or function.__name__ in wanted]


def tell(function, browser, server):
    """Whether the story went as it should; nothing may be left on the browser's console."""
    clean()
    browser.size(1280, 900)
    browser.dark(False)
    browser.zone("Europe/Berlin")
    browser.driver.get("about:blank")
    browser.errors()
    try:
        function(browser, server)
        same(browser.errors(), [])
        return True
    except (AssertionError, WebDriverException, OSError):
        traceback.print_exc(file=sys.stdout)
        print("the page:", browser.text("body")[:3000])
        print("the console:", browser.errors())
        browser.picture(os.path.join(os.environ.get("WEB_PICTURES", WORK), f"failed-{function.__name__}.png"))
        return False


def main():
    os.makedirs(WORK, exist_ok=True)
    os.chmod(WORK, 0o755)
    server = Server()
    browser = Browser()
    failed = False
    try:
        for sentence, function in picked():
            begin = time.monotonic()
            is_good = tell(function, browser, server)
            failed = failed or not is_good
            took = time.monotonic() - begin
            print(f"{'ok' if is_good else 'not ok'} - {sentence}" + (f" ({took:.1f} s)" if took > 5 else ""), flush=True)
    finally:
        browser.quit()
        server.stop()
    sys.exit(1 if failed else 0)


main()
