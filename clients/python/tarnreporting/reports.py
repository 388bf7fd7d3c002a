# SPDX-License-Identifier: Apache-2.0
"""Reports: messages that an engine posts without knowing a key, one method each. docs/messages.md lists them.

Made by tools/dictionary/generate.py from dictionary/messages.toml: change that, not this.
"""

from typing import Dict, Optional, Tuple

# Category, type, and each key with the kind of its values.
REPORTS: Dict[str, Tuple[int, int, Dict[str, type]]] = {
    "output_running": (4, 1, {"session_output_running": bool, "KvSessionVolume": float, "active_devices": str}),
    "output_stopped": (4, 2, {"session_output_running": bool}),
    "volume_changed": (14, 0, {"KvSessionVolume": float}),
    "route_changed": (10, 0, {"active_devices": str}),
    "input_running": (3, 1, {
        "session_input_running": bool,
        "active_devices": str,
        "vp_config_primary_vocoder": str,
        "vp_config_primary_vocoderFs": str,
    }),
    "codec_changed": (3, 5, {"vp_config_primary_vocoder": str, "vp_config_primary_vocoderFs": str}),
    "input_stopped": (3, 2, {"session_input_running": bool}),
    "overload": (7, 6, {"issue_type": str, "smallest_buffer_frame_size": int, "io_cycle": int}),
    "error": (11, 6, {"issue_type": str}),
    "session_duration": (1, 2, {"session_duration": float}),
}


class Reports:
    """What a session can report without a key, with the time of the call or `stamp`, in seconds since 1970 UTC. Each
    answers whether the message was posted."""

    def _report(self, name: str, stamp: Optional[float], *values: object) -> bool:
        raise NotImplementedError

    def output_running(self, volume: float, route: str, *, stamp: Optional[float] = None) -> bool:
        """Output runs from now on, at this volume (0 to 1), on this route."""
        return self._report("output_running", stamp, True, volume, route)

    def output_stopped(self, *, stamp: Optional[float] = None) -> bool:
        """Output runs no more."""
        return self._report("output_stopped", stamp, False)

    def volume_changed(self, volume: float, *, stamp: Optional[float] = None) -> bool:
        """The volume is this from now on, 0 to 1."""
        return self._report("volume_changed", stamp, volume)

    def route_changed(self, route: str, *, stamp: Optional[float] = None) -> bool:
        """These devices play or record from now on."""
        return self._report("route_changed", stamp, route)

    def input_running(self, route: str, codec: str, rate: int, *, stamp: Optional[float] = None) -> bool:
        """Input runs from now on, on this route, with this voice codec at this sampling rate in Hz."""
        return self._report("input_running", stamp, True, route, codec, f"{int(rate)}.0")

    def codec_changed(self, codec: str, rate: int, *, stamp: Optional[float] = None) -> bool:
        """The voice codec is this from now on, at this sampling rate in Hz."""
        return self._report("codec_changed", stamp, codec, f"{int(rate)}.0")

    def input_stopped(self, *, stamp: Optional[float] = None) -> bool:
        """Input runs no more."""
        return self._report("input_stopped", stamp, False)

    def overload(self, frames: int, cycle: int, *, stamp: Optional[float] = None) -> bool:
        """A cycle came too late, or a buffer ran empty: its size in frames, and which cycle it was."""
        return self._report("overload", stamp, "overload", frames, cycle)

    def error(self, what: str, *, stamp: Optional[float] = None) -> bool:
        """Something else went wrong; what, in a word or two."""
        return self._report("error", stamp, what)

    def session_duration(self, seconds: float, *, stamp: Optional[float] = None) -> bool:
        """What the session was for is over, and was active for so many seconds."""
        return self._report("session_duration", stamp, seconds)
