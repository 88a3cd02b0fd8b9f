"""What a play gave, as one JSON object on standard output: of each host and task the result, and the sums."""
import json

from ansible.plugins.callback import CallbackBase

DOCUMENTATION = """
name: ansible_told
type: stdout
short_description: one JSON object
description: For the tests.
"""


class CallbackModule(CallbackBase):
    CALLBACK_VERSION = 2.0
    CALLBACK_TYPE = "stdout"
    CALLBACK_NAME = "ansible_told"

    def __init__(self):
        super().__init__()
        self.hosts = {}

    def keep(self, result):
        self.hosts.setdefault(result._host.get_name(), {})[result.task_name] = result._result

    def v2_runner_on_ok(self, result):
        self.keep(result)

    def v2_runner_on_failed(self, result, ignore_errors=False):
        self.keep(result)

    def v2_runner_on_unreachable(self, result):
        self.keep(result)

    def v2_playbook_on_stats(self, stats):
        sums = {host: stats.summarize(host) for host in stats.processed}
        print(json.dumps({"hosts": self.hosts, "stats": sums}))
