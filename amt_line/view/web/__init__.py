"""The live view and the records in a browser: served from this process, without a network.

Made from events, the desk's questions and records, from nothing else. What a page needs comes from
this package; what it shows may come from anywhere and is never taken for markup.
"""

from amt_line.view.web.server import Page, start

__all__ = ["Page", "start"]
