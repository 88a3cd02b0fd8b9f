// Says when something has changed on the machine, as long as somebody looks at the page.
const cockpit = window.cockpit;

// The tasks, the power times, what becomes of runs, mails about failures, and cron's start.
const FILES = [
  "/tmp/scheduled_tasks",
  "/usr/zelo/etc/power_sched.conf",
  "/tmp/sched_status.sqlite",
  "/usr/zelo/var/history.sqlite",
  "/etc/default/zelosched-mail",
  "/etc/zelosched/run-ended.d/mail-on-failure",
  "/run/crond.pid",
];
const QUIET = 150; // ms in which what changes is one change: it writes several files
const LOOK = 10000; // ms between looks at what no file tells, such as that cron was killed
const ALL = 30000; // ms between asking for all, which shows anew how long ago things are

export class Watch {
  // `changed` asks the machine for all, `looked` for what no file tells.
  constructor(changed, looked) {
    this.changed = changed;
    this.looked = looked;
    this.channels = [];
    this.timer = null;
    cockpit.addEventListener("visibilitychange", () => this.followVisibility());
    this.followVisibility();
  }

  followVisibility() {
    if (cockpit.hidden) {
      this.stop();
    } else if (this.channels.length === 0) {
      this.start();
    }
  }

  start() {
    for (const path of FILES) {
      // cockpit.file() would read the whole of each file first.
      const channel = cockpit.channel({ payload: "fswatch1", path, superuser: "try" });
      channel.addEventListener("message", () => this.note());
      this.channels.push(channel);
    }
    this.timers = [window.setInterval(this.looked, LOOK), window.setInterval(this.changed, ALL)];
    this.changed();
  }

  stop() {
    for (const channel of this.channels) channel.close();
    this.channels = [];
    for (const timer of this.timers || []) window.clearInterval(timer);
    window.clearTimeout(this.timer);
    this.timer = null;
  }

  // What follows soon is of the same change.
  note() {
    if (this.timer === null) {
      this.timer = window.setTimeout(() => {
        this.timer = null;
        this.changed();
      }, QUIET);
    }
  }
}
