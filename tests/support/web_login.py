#!/usr/bin/python3
"""web_login.py PORT USER PASSWORD: somebody logs in to Cockpit there, gains administrative access from the
page of the scheduled tasks, and adds a task. For web_package.sh."""

import sys

from web_machine import *  # pylint: disable=wildcard-import,unused-wildcard-import


def main():
    port, user, password = sys.argv[1:]
    os.makedirs(WORK, exist_ok=True)
    wait_for("cockpit-ws listens", lambda: is_listening(int(port)))
    browser = Browser()
    try:
        browser.driver.get(f"http://127.0.0.1:{port}/zelosched")
        wait_for("the login", lambda: browser.find("#login-user-input").is_displayed())
        browser.find("#login-user-input").send_keys(user)
        browser.find("#login-password-input").send_keys(password)
        browser.find("#login-button").click()
        frame = wait_for("the page in the shell", lambda: browser.find("iframe[name='cockpit1:localhost/zelosched']"), 30)
        browser.see("Scheduled tasks", "nav, #host-apps, body")
        browser.driver.switch_to.frame(frame)
        browser.see("You see what every user may see")
        browser.see_not("Add the first task")
        browser.click("Turn on administrative access")
        for attempt in ("wrong", password):
            field = wait_for("a question for the password", lambda: browser.find("dialog input[type=password]"))
            field.send_keys(attempt)
            browser.dialog("Authenticate")
            if attempt == "wrong":
                wait_for("it asks again", lambda: browser.find("dialog input[type=password]").get_attribute("value") == "")
        browser.driver.switch_to.default_content()

        def has_access():
            browser.driver.switch_to.default_content()
            browser.driver.switch_to.frame(browser.find("iframe[name='cockpit1:localhost/zelosched']"))
            return "Add the first task" in browser.text("body")

        wait_for("administrative access", has_access, 30)
        browser.click("Add the first task")
        browser.write("Name", "Saved in the browser")
        browser.write("Command", "true")
        browser.click("Add the task")
        browser.see("Saved in the browser was saved")
        browser.click("Run now")
        browser.see("finished")
    except Exception:
        browser.driver.switch_to.default_content()
        print(browser.text("body")[:2000], browser.errors())
        browser.picture(os.path.join(BUILD, "failed-login.png"))
        raise
    finally:
        browser.quit()


main()
