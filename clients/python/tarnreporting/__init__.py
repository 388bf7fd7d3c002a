# SPDX-License-Identifier: Apache-2.0
"""Reports what audio software does to the reporting service.

    import tarnreporting
    from tarnreporting import Category, ServiceType, Type

    with tarnreporting.Client() as client:
        with client.session(ServiceType.LONG_FORM_AUDIO, "org.example.player") as session:
            session.output_running(volume=0.5, route="Speaker")
            session.post(Category.PLAYBACK, Type.GENERIC, {"track": "8f02-01", "queue position": 2})
            session.output_stopped()

Needs the library libtarnreporting.so.1 (the path TARNREPORTING_LIBRARY, where that is set). No call waits for the
service but close() and flush(), and those only as long as they may. What the service refuses and why it isn't reached
goes to the logger "tarnreporting". Any thread and any task of asyncio may call anything; clients that are still open
when the interpreter ends are closed then. After os.fork() the child opens a client of its own.
"""

import logging

from ._client import Client, Error, Result, Session, Shape, Stats
from ._library import LibraryNotFound
from .messages import Category, Domain, Key, ServiceType, Type
from .reports import Reports

__all__ = ["Category", "Client", "Domain", "Error", "Key", "LibraryNotFound", "Reports", "Result", "ServiceType",
           "Session", "Shape", "Stats", "Type"]
__version__ = "1.0.0"

logging.getLogger(__name__).addHandler(logging.NullHandler())
