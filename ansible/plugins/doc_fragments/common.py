"""The options that the modules share: COMMON_OPTIONS of module_utils/zelosched.py."""
from __future__ import absolute_import, division, print_function

__metaclass__ = type


class ModuleDocFragment(object):
    DOCUMENTATION = r"""
options:
  stagger:
    description:
      - Spreads the times over so many minutes or hours, such as C(30m) or C(2h), by the machine and the task, so that
        many machines do not begin at once. The same machine always gets the same times.
    type: str
  force:
    description: Also changes and removes tasks that their application hides or protects.
    type: bool
    default: false
  executable:
    description: The program, where it is not in the usual place.
    type: path
  timeout:
    description:
      - The program is ended when it runs for longer than so many seconds; 0 for no limit. What is changed by then
        stays changed, and another play does the rest.
    type: int
    default: 600
"""
