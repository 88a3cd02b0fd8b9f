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


def fails(name):
    """A run that does not end well."""
    subprocess.run([BUILD + "/bin/zelosched", "run", name, "--wait"], check=False, stdout=subprocess.DEVNULL,
                   stderr=subprocess.DEVNULL)


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
    wait_for("it can be switched", lambda: browser.find("tbody input[role=switch]").is_enabled())
    browser.find("tbody input[role=switch]").click()
    wait_for("it is off", lambda: not task("Nightly backup")["enabled"])
    browser.see("switched off", "tbody")
    browser.find("tbody input[role=switch]").click()
    wait_for("it is on", lambda: task("Nightly backup")["enabled"])


@story("health tells what is wrong, worst first, with what helps")
def unwell(browser, server):
    add("--daily", "02:30", "--name", "Backup", command="echo no space left; exit 3")
    fails("Backup")
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


@story("the list is filtered by text, application and failure, and the address remembers it")
def filtered(browser, server):
    add("--daily", "02:30", "--name", "Backup of mail", "--app", "backup", command="false")
    add("--daily", "03:30", "--name", "Backup of photos", "--app", "backup")
    add("--daily", "04:30", "--name", "Report", "--owner", "nobody", command="print-mail")
    fails("Backup of mail")
    browser.open(server.url)
    browser.see("3 tasks")
    search = browser.find("input[type=search]")
    search.send_keys("MAIL")
    browser.see("2 of 3 tasks")
    same(sorted(column(browser, "name")), ["Backup of mail\nbackup", "Report"])
    search.send_keys(" nobody")
    browser.see("1 of 3 tasks")
    browser.set(search, "")
    browser.set(browser.find(".tools select"), "backup")
    browser.see("2 of 3 tasks")
    browser.click("Only failed", "label")
    browser.see("1 of 3 tasks")
    wait_for("the address tells it", lambda: "app=backup" in browser.driver.current_url
             and "failed=1" in browser.driver.current_url)
    address = browser.driver.current_url
    browser.driver.get("about:blank")
    browser.driver.get(address)
    browser.see("1 of 3 tasks")
    same(column(browser, "name"), ["Backup of mail\nbackup"])
    browser.set(browser.find("input[type=search]"), "nothing is like this")
    browser.see("No task is like that")


@story("the list is sorted by each column, both ways")
def ordered(browser, server):
    add("--daily", "05:00", "--name", "b", "--owner", "nobody")
    add("--weekly", "mon", "04:00", "--name", "C", "--disabled")
    add("--monthly", "1", "06:00", "--name", "a10")
    add("--monthly", "1", "06:00", "--name", "a9")
    z("run", "a9", "--wait")
    browser.open(server.url)
    browser.see("4 tasks")
    same(column(browser, "name"), ["b", "a10", "a9", "C"])
    for label, wanted in (("Name", ["a9", "a10", "b", "C"]), ("Owner", ["b", "C", "a10", "a9"]),
                          ("Schedule", ["b", "C", "a10", "a9"]), ("Last run", ["a9", "b", "C", "a10"]),
                          ("On", ["b", "a10", "a9", "C"])):
        browser.click(label)
        wait_for(f"sorted by {label}: {column(browser, 'name')}", lambda w=wanted: column(browser, "name") == w)
        same(browser.all("th[aria-sort=ascending]")[0].text.split()[0], label.split()[0])
    browser.click("Name")
    browser.click("Name")
    wait_for("the other way round", lambda: column(browser, "name") == ["C", "b", "a10", "a9"])
    assert "sort=name" in browser.driver.current_url and "desc=1" in browser.driver.current_url
    browser.driver.refresh()
    wait_for("again", lambda: column(browser, "name") == ["C", "b", "a10", "a9"])


# ---- one task -------------------------------------------------------------------------------


@story("a task shows its next five runs, its runs with a chart, and what each printed")
def one_task(browser, server):
    number = add("--weekly", "mon", "08:00", "--name", "Weekly", "--time-limit", "2h", command="echo largo; sleep 0.05")
    for _ in range(3):
        z("run", "Weekly", "--wait")
    add("--daily", "08:00", "--name", "Bytes", command="printf 'a\\377b'")
    z("run", "Bytes", "--wait")
    add("--daily", "08:00", "--name", "Much", command="seq 100000")
    z("run", "Much", "--wait")
    browser.open(server.url)
    browser.click("Weekly")
    browser.see("Monday at 08:00")
    wait_for("five runs", lambda: len(browser.all(".coming li")) == 5)
    due = [run["due"] for run in json.loads(z("next", str(number), "--count", "5", "--json"))["runs"]]
    for shown, time_text in zip(browser.all(".coming li"), due):
        assert int(time_text[8:10]) in numbers(shown.text) and "08:00" in shown.text, (shown.text, time_text)
    same(len(browser.all(".chart rect.good")), 3)
    browser.see("How long the last 3 runs took")
    browser.see("2 hours", ".facts")
    same(len(browser.shown("section .table tbody tr")), 3)
    browser.shown("td.c-output button")[1].click()
    browser.see("largo", ".output")
    assert "run=2" in browser.driver.current_url
    browser.open(server.url, f"task/{task('Bytes')['id']}?run=4")
    browser.see("a\ufffdb", ".output")
    browser.open(server.url, f"task/{task('Much')['id']}?run=5")
    browser.see("bytes are left out here", ".output")
    browser.see("100000", ".output")
    browser.open(server.url, "task/99")
    browser.see("There is no such task")


@story("a run is started, watched while it prints, and stopped")
def run_and_stop(browser, server):
    number = add("--daily", "02:30", "--name", "Long", command="echo first; sleep 1.5; echo second; sleep 60")
    browser.open(server.url, f"task/{number}")
    browser.click("Run now")
    browser.see("Long was started")
    browser.see("first", ".output")
    assert "second" not in browser.text(".output")
    browser.see("second", ".output")
    browser.see("is running")
    browser.click("Stop")
    browser.see("Stop Long?", "dialog")
    browser.dialog("Stop")
    browser.see("was stopped")
    same([(run["outcome"], run["trigger"]) for run in runs("Long")], [("stopped", "manual")])


@story("a task is removed after a question that names it")
def removed(browser, server):
    number = add("--daily", "02:30", "--name", "Old backup")
    add("--daily", "02:30", "--name", "Other")
    browser.open(server.url, f"task/{number}")
    browser.click("Remove")
    browser.see("Remove Old backup?", "dialog")
    browser.dialog("Cancel")
    same(len(tasks()), 2)
    browser.click("Remove")
    browser.dialog("Remove")
    browser.see("Old backup was removed")
    browser.see("1 task")
    same([one["name"] for one in tasks()], ["Other"])


# ---- adding and changing --------------------------------------------------------------------


@story("tasks of every kind of schedule are added with the form")
def added(browser, server):
    kinds = (
        ("Daily", {"When": "daily", "Time": "02:30"}, {"type": "daily", "at": "02:30"}),
        ("Repeated", {"When": "daily", "Time": "08:15", "Repeat on that day": "2", "Until the hour": "18"},
         {"type": "daily", "at": "08:15", "every_hours": 2, "until_hour": 18}),
        ("Monthly", {"When": "monthly", "Day of the month": "31", "Time": "06:00"},
         {"type": "monthly", "day": 31, "at": "06:00"}),
        ("Yearly", {"When": "yearly", "Month": "2", "Day of the month": "29", "Time": "06:00"},
         {"type": "yearly", "month": 2, "day": 29, "at": "06:00"}),
        ("Once", {"When": "once", "Date": "2099-12-24", "Time": "18:30"},
         {"type": "once", "date": "2099-12-24", "at": "18:30"}),
        ("Later", {"When": "daily", "Time": "02:30", "Not before": "2099-01-01"},
         {"type": "daily", "at": "02:30", "from": "2099-01-01"}),
    )
    for name, fields, wanted in kinds:
        browser.open(server.url, "add")
        browser.write("Name", name)
        browser.write("Command", "echo " + name)
        for label, value in fields.items():
            browser.choose(label, value)
        browser.click("Add the task")
        browser.see(name + " was saved")
        got = task(name)
        same(got["command"], "echo " + name)
        same({key: got["schedule"].get(key) for key in wanted}, wanted)


@story("a weekly task is added with all there is to say, and changed again")
def weekly(browser, server):
    browser.open(server.url, "add")
    browser.write("Name", "Weekly")
    browser.write("Command", "one\ntwo")
    browser.choose("When", "weekly")
    for day in ("Wednesday", "Thursday"):
        browser.click(day, "input")
    browser.click("More")
    browser.shown("[aria-label='Time limit']")[-1].send_keys("90")
    browser.set(browser.find("[aria-label='Unit of the time limit']"), "m")
    browser.click("A run may start while another one of this task goes on", "label")
    browser.write("Application", "backup")
    wait_for("the users are there", lambda: browser.find("option[value=nobody]"))
    browser.choose("Runs as", "nobody")
    browser.click("Switched on", "label")
    browser.click("Add the task")
    browser.see("Weekly was saved")
    got = task("Weekly")
    same([got[key] for key in ("owner", "enabled", "app", "time_limit", "command")], ["nobody", False, "backup", "90m", "one\ntwo"])
    same((got["schedule"]["days"], got["overlap"]), (["mon", "tue", "fri"], {"task": True, "app": True}))
    browser.click("Edit")
    browser.see("Edit Weekly")
    same(browser.field("Command").get_attribute("value"), "one\ntwo")
    browser.write("Name", "Weekly now")
    browser.click("Save")
    browser.see("Weekly now was saved")
    changed = task("Weekly now")
    same({key: changed[key] for key in changed if key != "name"}, {key: got[key] for key in got if key != "name"})


@story("the form shows when the task would run while it is written, and saves nothing by that")
def previewed(browser, server):
    browser.open(server.url, "add")
    wait_for("five runs", lambda: len(browser.all(".coming li")) == 5)
    browser.choose("When", "once")
    browser.choose("Date", "2099-12-24")
    browser.choose("Time", "18:30")
    wait_for("one run", lambda: ["2099" in one.text and "18:30" in one.text for one in browser.all(".coming li")] == [True])
    browser.choose("Date", "2001-01-01")
    browser.see("Not as it stands")
    same(tasks(), [])


@story("what the tool refuses stands beside its field, and nothing that was typed is lost")
def refused(browser, server):
    browser.open(server.url, "add")
    browser.choose("When", "once")
    browser.choose("Date", "2001-01-01")
    browser.write("Name", "Typed")
    browser.click("Add the task")
    browser.see("There is no command", ".fields")
    fields = {one.find_element(By.CSS_SELECTOR, "label, .label").text: one.find_element(By.CSS_SELECTOR, ".fault").text
              for one in browser.shown(".field")}
    assert "no command" in fields["Command"] and "is over: write a later date" in fields["Date"], fields
    same([fields["Name"], fields["Time"]], ["", ""])
    same(browser.focused().get_attribute("aria-invalid"), "true")
    same(tasks(), [])
    browser.write("Command", "true")
    browser.choose("Date", "2099-01-01")
    browser.see_not("There is no command", ".fields")
    # Another program has saved a task that keeps all others from being saved.
    other = add("--daily", "08:30", "--name", "Other")
    library("sed -i 's/^run hour=.*/run hour=\"25\"/' $STORE $PERSISTENT")
    browser.click("Add the task")
    browser.see("nothing was saved, as cron may then pass over all of /etc/crontab")
    same([browser.field(label).get_attribute("value") for label in ("Name", "Command", "Date")],
         ["Typed", "true", "2099-01-01"])
    z("remove", str(other), "--yes")
    browser.click("Add the task")
    browser.see("Typed was saved")
    same(task("Typed")["schedule"]["date"], "2099-01-01")


@story("a form tells when its task has been changed elsewhere, and asks before it is left")
def changed_elsewhere(browser, server):
    number = add("--daily", "02:30", "--name", "Shared")
    browser.open(server.url, f"task/{number}/edit")
    browser.see("Edit Shared")
    browser.write("Command", "mine")
    z("edit", str(number), "--daily", "05:30")
    browser.see("has been changed elsewhere")
    same(browser.field("Command").get_attribute("value"), "mine")
    browser.click("Cancel")
    browser.dialog("Cancel")
    browser.click("Show it as it is now")
    wait_for("the time is the new one", lambda: browser.field("Time").get_attribute("value") == "05:30")
    browser.click("Cancel")
    browser.see("Every day at 05:30")


# ---- the calendar and power -----------------------------------------------------------------


@story("the calendar shows the runs of a week, the machine's off times as bands, and leads to the task")
def calendar(browser, server):
    add("--daily", "12:10", "--name", "Noon")
    add("--daily", "12:40", "--name", "Afternoon", "--disabled")
    add("--daily", "03:00", "--name", "Night")
    for i in range(6):
        add("--daily", f"18:0{i}", "--name", f"Evening {i}")
    z("power", "add", "off", "--daily", "23:30")
    z("power", "add", "on", "--daily", "07:00")
    browser.open(server.url, "calendar")
    browser.see("Noon", ".calendar")
    same(len(browser.all("section.day")), 7)
    coming = json.loads(z("next", "--within", "7d", "--json"))["runs"]
    days = sorted({run["due"][:10] for run in coming})[:7]
    coming = [run for run in coming if run["due"][:10] in days]
    noons = [run for run in coming if run["task_name"] == "Noon"]
    same(len([one for one in browser.all(".hour[data-hour='12'] .run") if "Noon" in one.text]), len(noons))
    assert "Afternoon" not in browser.text(".calendar")
    tomorrow = browser.all("section.day")[1]
    off = [one.get_attribute("data-hour") for one in tomorrow.find_elements(By.CSS_SELECTOR, ".hour.off")]
    same(off, ["00", "01", "02", "03", "04", "05", "06", "23"])
    band = tomorrow.find_element(By.CSS_SELECTOR, ".hour[data-hour='23'] rect")
    same((float(band.get_attribute("y")), float(band.get_attribute("height"))), (30.0, 30.0))
    assert tomorrow.find_element(By.CSS_SELECTOR, ".hour[data-hour='03'] .run.missed")
    nights = len([run for run in coming if run["task_name"] == "Night"])
    browser.see(f", {nights} of them while the machine is off.")
    tomorrow.find_element(By.CSS_SELECTOR, "button.more-runs").click()
    wait_for("all six", lambda: len(browser.all("dialog .run")) == 6)
    browser.named("18:05 Evening 5").click()
    browser.see("Every day at 18:05")


@story("power times are added, changed, switched off and removed in the week by mouse and keyboard")
def power(browser, server):
    browser.open(server.url, "power")
    browser.see("There is no power time")
    browser.shown(".cell")[7 * 23 + 0].click()  # Monday, 23 o'clock
    for day in ("Tuesday", "Wednesday", "Thursday", "Friday"):
        browser.click(day, "dialog input")
    browser.dialog("Save")
    browser.see("Monday to Friday at 23:00")
    browser.see("never on again")
    wait_for("cells", lambda: len(browser.all(".cell .power-mark.off")) == 5)
    same([(one["power"], one["days"], one["at"]) for one in power_times()],
         [("off", ["mon", "tue", "wed", "thu", "fri"], "23:00")])
    cell = browser.find(".cell[tabindex='0']")
    browser.script("arguments[0].focus()", browser.shown(".cell")[7 * 8])
    browser.keys(Keys.ARROW_UP)
    assert browser.focused().get_attribute("aria-label").startswith("Monday 7:00"), cell
    browser.keys(Keys.ENTER)
    browser.choose("The machine goes", "on")
    browser.click("Tuesday", "dialog input")
    browser.keys(Keys.ENTER)
    browser.see("Mon, Tue at 07:00")
    browser.see("Its clock is armed")
    # Changing: only the time.
    browser.script("arguments[0].focus()", browser.shown(".cell")[7 * 7])
    browser.keys(Keys.ENTER)
    browser.see("Change the power time", "dialog")
    browser.choose("Time", "07:30")
    browser.dialog("Save")
    browser.see("Mon, Tue at 07:30")
    same(sorted((one["power"], one["at"]) for one in power_times()), [("off", "23:00"), ("on", "07:30")])
    browser.find("input[aria-label^='Machine off']").click()
    wait_for("it is off", lambda: [one["enabled"] for one in power_times() if one["power"] == "off"] == [False])
    browser.script("arguments[0].focus()", browser.shown(".cell")[7 * 7])
    browser.keys(Keys.DELETE)
    browser.see("Machine on: Mon, Tue at 07:30", "dialog")
    browser.dialog("Remove")
    wait_for("it is gone", lambda: [one["power"] for one in power_times()] == ["off"])
    browser.see_not("07:30", "main")
    browser.find("input[aria-label^='Machine off']").click()
    wait_for("it is on", lambda: [one["enabled"] for one in power_times()] == [True])
    # One that is refused: there is one alike.
    browser.click("Add a power time")
    browser.choose("Time", "23:00")
    for day in ("Tuesday", "Wednesday", "Thursday", "Friday"):
        browser.click(day, "dialog input")
    browser.dialog("Save")
    wait_for("a fault", lambda: browser.text("dialog .fault[role=alert]"))
    browser.dialog("Cancel")
    os.remove("/sys/class/rtc/rtc0/wakealarm")
    subprocess.run([BUILD + "/bin/zelosched", "power", "add", "on", "--daily", "06:00"], check=False,
                   stderr=subprocess.DEVNULL)
    browser.see("has no clock that could be armed")
    library(": >$ALARM")


# ---- what happens elsewhere -----------------------------------------------------------------


@story("what is changed elsewhere shows within two seconds, also in another browser")
def live(browser, server):
    browser.open(server.url)
    browser.see("There is no task yet")
    slowest = 0
    for what, shown in ((lambda: add("--daily", "02:30", "--name", "From the shell", command="sleep 1"), "From the shell"),
                        (lambda: z("disable", "From the shell"), "switched off"),
                        (lambda: z("edit", "From the shell", "--daily", "05:15"), "05:15"),
                        (lambda: z("run", "From the shell"), "is running")):
        what()
        begin = time.monotonic()
        browser.see(shown, "tbody")
        slowest = max(slowest, time.monotonic() - begin)
    ended = wait_for("the run has ended", lambda: [run for run in runs("From the shell") if run["end"]])
    begin = time.monotonic()
    same(len(ended), 1)
    browser.see("finished", "tbody")
    slowest = max(slowest, time.monotonic() - begin)
    first = browser.driver.current_window_handle
    browser.driver.switch_to.new_window("window")
    browser.open(server.url, "power")
    browser.click("Add a power time")
    browser.dialog("Save")
    browser.see_not("There is no power time")
    wait_for("it is stored", power_times)
    browser.driver.close()
    browser.driver.switch_to.window(first)
    z("remove", "From the shell", "--yes")
    begin = time.monotonic()
    browser.see("There is no task yet")
    slowest = max(slowest, time.monotonic() - begin)
    print(f"# what was changed elsewhere showed within {slowest:.2f} s")
    assert slowest < 2, slowest


@story("the focus, a selection and an open output stay when something comes in")
def undisturbed(browser, server):
    add("--daily", "02:30", "--name", "One")
    add("--daily", "03:30", "--name", "Two")
    browser.open(server.url)
    browser.see("2 tasks")
    browser.script("arguments[0].focus()", browser.all("tbody a.name")[1])
    add("--daily", "01:30", "--name", "Zero")
    browser.see("3 tasks")
    same(browser.focused().text, "Two")


@story("a page that is hidden asks nothing, and asks when it is seen again")
def hidden(browser, server):
    add("--daily", "02:30", "--name", "One")
    browser.open(server.url)
    browser.see("One")
    hide(browser, True)
    settle(server)
    calls = len(server.calls())
    add("--daily", "03:30", "--name", "Two")
    z("run", "One", "--wait")
    time.sleep(1.5)
    same(server.calls()[calls:], [])
    same("Two" in browser.text(), False)
    hide(browser, False)
    browser.see("Two")


def hide(browser, is_hidden):
    """As Cockpit's shell tells a page that another one is in front of it."""
    browser.script("""Object.defineProperty(document, "hidden", {value: arguments[0], configurable: true});
        document.dispatchEvent(new Event("visibilitychange"))""", is_hidden)


def settle(server):
    """Until no call has come for half a second."""
    before = -1
    while before != len(server.calls()):
        before = len(server.calls())
        time.sleep(0.5)


@story("times are the machine's, and the page says so where the browser's differ")
def zones(browser, server):
    add("--daily", "02:30", "--name", "One")
    browser.open(server.url)
    browser.see("02:30", "tbody")
    browser.see_not("another time zone")
    browser.zone("Asia/Tokyo")
    browser.open(server.url)
    browser.see("All times are the machine's (UTC+01:00). This browser is in another time zone (UTC+09:00).")
    assert "02:30" in column(browser, "next")[0], column(browser, "next")


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
