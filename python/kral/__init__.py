"""kral: manufacturing and test support for mobile handsets.

    import kral

    with kral.connect(7) as phone:
        print(phone.identity.model, hex(phone.identity.serial))
        phone.mode = kral.Mode.FTM
        phone.ftm.set_rf_mode(kral.RfMode.WCDMA)
        phone.ftm.set_channel(9750)

Failures are exceptions, a class for each outcome: NoPort, PortBusy, NoAnswer, LinkError, Refused (with `.status`),
Mismatch, Lost, BadFile, Aborted ...; all are KralError, and `.record` has what the library kept of the failure.

The library is the one that KRAL_LIBRARY names, else the one beside this package, else the installed one;
`kral.library_path()` tells which, and so does `python3 -m kral`. A call leaves the interpreter free; Ctrl-C ends one
that takes long with the request under way. `kral.api()` has the whole C interface for ctypes.
"""
from kral import bands
from kral._api import VERSION as __version__, FtmModeId, RfMode, TimeOut
from kral._library import LibraryNotFound, library_path, library_version, load as api
from kral.errors import (Aborted, BadArgument, BadFile, ErrorRecord, FileError, InternalError, KralError, LinkError,
                         Lost, Mismatch, NoAnswer, NoPort, PortBusy, Refused, SafetyStop, error_text)
from kral.files import Entry, Files, Status
from kral.flashing import ImageInfo, flash, image_info
from kral.ftm import Ftm
from kral.jobs import Job, JobProgress, Verdict
from kral.modes import Mode
from kral.nv import Nv, NvDefinition, NvError, NvValue
from kral.phone import Identity, Phone, connect, ports
from kral.pkv import PkvItem, PkvResult
from kral.traffic import Event, Packet

__all__ = [
    "Aborted", "BadArgument", "BadFile", "Entry", "ErrorRecord", "Event", "FileError", "Files", "Ftm", "FtmModeId",
    "Identity", "ImageInfo", "InternalError", "Job", "JobProgress", "KralError", "LibraryNotFound", "LinkError",
    "Lost", "Mismatch", "Mode", "NoAnswer", "NoPort", "Nv", "NvDefinition", "NvError", "NvValue", "Packet", "Phone",
    "PkvItem", "PkvResult", "PortBusy", "Refused", "RfMode", "SafetyStop", "Status", "TimeOut", "Verdict",
    "__version__", "api", "bands", "connect", "error_text", "flash", "image_info", "library_path",
    "library_version", "ports",
]
