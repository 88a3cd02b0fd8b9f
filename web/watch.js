// Reports changes on the machine as long as the page is visible.
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
const QUIET = 150; // ms in which changed files count as one change
const LOOK = 10000; // ms between checks of what no file shows, such as that cron was killed
const ALL = 30000; // ms between full updates, which also update relative times

export class Watch {
  // `changed` asks the machine for all, `looked` for what no file shows.
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

  // Further files soon after count as the same change.
  note() {
    if (this.timer === null) {
      this.timer = window.setTimeout(() => {
        this.timer = null;
        this.changed();
      }, QUIET);
    }
  }
}
