"""The package against a simulated handset."""
import array
import copy
import ctypes
import gc
import os
import pathlib
import pickle
import struct
import threading
import time
from collections.abc import Mapping
from concurrent.futures import ThreadPoolExecutor

import pytest

import kral
from kral import _api, bands

DEFINITIONS = """<NvDefinition version="1.0">
  <NvItem id="453" name="FTM_MODE"><DataType><Member name="enabled" typeid="word8"/></DataType></NvItem>
  <NvItem id="10" name="PREFERENCE"><DataType><Member name="level" typeid="word16" signed="1"/>
    <Member name="offset" typeid="word8" signed="1"/></DataType></NvItem>
  <NvEfsItem fullpathname="/nv/item_files/limit" name="LIMIT">
    <DataType><Member name="limit" typeid="word16" signed="1"/></DataType></NvEfsItem>
</NvDefinition>"""


# A radio that knows no such command acknowledges it as it came.
COMMANDS = """<CommandDefinition><Enumeration name="Rate"><Value name="11M" value="3"/></Enumeration>
  <Family name="WLAN" frame="ftm" mode="22"><Command name="TX_START" id="900" doc="Starts to transmit">
    <Request><Field name="channel" type="u8" min="1" max="14" doc="Channel"/><Field name="rate" type="u8" enum="Rate"/>
      <Field name="points" type="record" count="2"><Field name="power" type="s16"/></Field>
      <Field name="label" type="text" size="6"/><Field name="data" type="bytes" size="*"/></Request>
    <Reply><Field name="channel" type="u8"/><Field name="rate" type="u8" enum="Rate"/>
      <Field name="points" type="record" count="2"><Field name="power" type="s16"/></Field>
      <Field name="label" type="text" size="6"/><Field name="data" type="bytes" size="*"/></Reply>
  </Command></Family></CommandDefinition>"""


@pytest.fixture
def defined(phone, tmp_path):
    """A phone whose NV items are defined."""
    file = tmp_path / "definitions.xml"
    file.write_text(DEFINITIONS)
    phone.nv.load_definitions(file)
    return phone


@pytest.mark.handset("--esn", "305419896", "--model", "Model X", "--software", "S-1")
def test_identity_and_mode(phone):
    identity = phone.identity
    assert (identity.serial, identity.model, identity.software) == (0x12345678, "Model X", "S-1")
    assert phone.mode == kral.Mode.ONLINE
    phone.mode = kral.Mode.FTM
    assert phone.mode is kral.Mode.FTM and phone.ftm.is_active
    assert phone.request(b"\x00")[0] == 0
    assert phone.unlock("000000") and not phone.unlock("123456")


def test_factory_test_commands(phone):
    with phone.ftm.active():
        phone.ftm.set_rf_mode(kral.RfMode.GSM)
        assert phone.ftm.mode_id == kral.FtmModeId.GSM
        phone.ftm.set_channel(62)
        assert phone.ftm.send("SET_TX_POWER_DBM", struct.pack("<h", 1000)) is not None
        with pytest.raises(kral.BadArgument):
            phone.ftm.send("SET_CHAN", b"")
    assert phone.mode == kral.Mode.ONLINE


def test_commands_by_definition(phone, tmp_path):
    file = tmp_path / "commands.xml"
    file.write_text(COMMANDS)
    assert phone.cmd.load(file) == 1 and phone.cmd.names() == ["WLAN.TX_START"]
    start = phone.cmd.WLAN.TX_START
    assert "Starts to transmit" in start.__doc__ and "channel: u8 1 to 14  Channel" in start.__doc__
    assert "WLAN" in dir(phone.cmd) and dir(phone.cmd.WLAN) == ["TX_START"]
    with phone.ftm.active():
        reply = start(channel=6, rate="11M", points=[{"power": -5}, {"power": 7}], label='a "b', data=b"\x01\xff")
        assert (reply.channel, reply.rate, reply["label"], reply.data) == (6, "11M", 'a "b', b"\x01\xff")
        assert [point.power for point in reply.points] == [-5, 7]
        with pytest.raises(kral.BadArgument, match="channel=15 is out of range: 1 to 14"):
            start(channel=15)
        with ThreadPoolExecutor(2) as threads:  # nobody gets the other's reply
            fields = {"rate": "11M", "points": [{"power": 1}, {"power": 2}], "label": "", "data": b""}
            replies = list(threads.map(lambda i: start(channel=1 + i % 2, **fields).channel, range(400)))
        assert replies == [1, 2] * 200
    assert not hasattr(phone.cmd.WLAN, "TX_STOP")
    phone.cmd.clear()
    assert not hasattr(phone.cmd, "WLAN")


def test_fields_may_have_any_name(phone, tmp_path):
    names = ("self", "keys", "items", "values", "get", "_fields", "name")
    fields = "".join(f"<Field name='{name}' type='u8'/>" for name in (*names, "__class__"))
    file = tmp_path / "names.xml"
    file.write_text(f"<CommandDefinition><Family name='ECHO' frame='ftm' mode='22'><Command name='BACK' id='901'>"
                    f"<Request>{fields}</Request><Reply>{fields}</Reply></Command></Family></CommandDefinition>")
    phone.cmd.load(file)
    given = {name: 65 + place for place, name in enumerate((*names, "__class__"))}
    with phone.ftm.active():
        reply = phone.cmd.ECHO.BACK(**given)
    assert [getattr(reply, name) for name in names] == [given[name] for name in names]
    assert isinstance(reply, Mapping) and reply["__class__"] == given["__class__"]
    assert reply == given and given == reply and reply != {} and "keys=66" in repr(reply)
    assert not hasattr(reply, "x") and copy.copy(reply) == reply
    with pytest.raises(kral.BadArgument, match="self=256 is out of range"):
        phone.cmd.ECHO.BACK(**{**given, "self": 256})


def test_definitions_may_be_looked_up_while_they_are_cleared_and_loaded(phone, tmp_path):
    file = tmp_path / "commands.xml"
    file.write_text(COMMANDS.replace("</Family>", "".join(f"<Command name='C{i}' id='{i + 90}'/>" for i in range(40)) +
                                     "</Family>"))

    def look_up(_):
        names = phone.cmd.names()
        return len(names) in (0, 41) and (not hasattr(phone.cmd, "WLAN") or bool(dir(phone.cmd)))

    with ThreadPoolExecutor(2) as threads:
        looked = threads.map(look_up, range(400))
        for _ in range(100):
            phone.cmd.clear()
            assert phone.cmd.load(file) == 41
        assert all(looked)


def test_nv_items_as_bytes_and_by_name(defined):
    nv = defined.nv
    nv.write(453, b"\x01")
    assert nv.read(453)[:2] == b"\x01\0"
    assert int(nv["FTM_MODE"]) == 1 and nv[453]["enabled"] == 1
    nv["PREFERENCE"] = (-300, 7)
    nv["PREFERENCE"] = {"offset": -8}
    assert nv["PREFERENCE"].asdict() == {"level": -300, "offset": -8}
    nv["LIMIT"] = -5
    assert defined.files.get("/nv/item_files/limit") == struct.pack("<h", -5)
    with pytest.raises(kral.KralError) as failure:
        nv["FTM_MODE"] = 256
    assert failure.value.tool_code == _api.KRAL_NV_ERROR_CANNOT_SET_VALUE
    with pytest.raises(KeyError):
        nv["NO_SUCH_ITEM"]
    nv["FTM_MODE"] = True
    assert nv["FTM_MODE"] == (1,)
    for misnamed in (lambda: nv["FTM_MODE"]["other"], lambda: nv.__setitem__("PREFERENCE", {"levle": 1})):
        with pytest.raises(KeyError, match="not among the fields"):
            misnamed()
    for copied in (copy.copy, copy.deepcopy, lambda value: pickle.loads(pickle.dumps(value))):
        assert copied(nv["PREFERENCE"])["offset"] == -8
    assert list(nv) == ["FTM_MODE", "PREFERENCE", "LIMIT"]
    assert "LIMIT" in nv and 453 in nv and "NO_SUCH_ITEM" not in nv and ("LIMIT", 1) not in nv


@pytest.mark.handset(files={"/a/b/one": b"1", "/a/two": b"22"})
def test_files(phone, tmp_path):
    files, told = phone.files, []
    assert [(path, [entry.name for entry in rest]) for path, _, rest in files.walk("/a")] == [
        ("/a", ["two"]), ("/a/b", ["one"])]
    data = bytes(range(256)) * 40
    files.put(data, "/a/big", progress=lambda done, total: told.append((done, total)))
    assert files.get("/a/big") == data and told[-1] == (len(data), len(data)) and len(told) > 3
    files.get(pathlib.PurePosixPath("/a/big"), to=tmp_path / "copy")
    assert (tmp_path / "copy").read_bytes() == data
    files.put(tmp_path / "copy", "/a/again")
    files.rename("/a/again", "/a/b/again")
    assert files.stat("/a/b/again").size == len(data) and not files.exists("/a/again")
    assert sorted(entry.name for entry in files.listdir("/a")) == ["b", "big", "two"]
    files.remove("/a/b/again")
    files.mkdir("/a/b")  # is there already
    for index in range(70):
        files.put_item(b"x", f"/a/b/{index:02}")
    assert len(files.listdir("/a/b")) == 71
    odd = os.fsdecode(b"/a/b/\xff")  # no text: it is given back as it came
    files.mkdir(odd)
    files.put(memoryview(b"1"), odd + "/x")
    assert [path for path, _, _ in files.walk("/a/b")] == ["/a/b", odd] and files.get(odd + "/x") == b"1"
    assert not files.exists("/a/two/x")
    for call in (lambda: files.rmdir("/a/b"), lambda: files.get("/a"), lambda: files.listdir("/none"),
                 lambda: files.get("/none", to=tmp_path / "none"), lambda: files.put(b"", "/none/x"),
                 lambda: files.put_item(b"", "/none/x"), lambda: files.mkdir("/a/two")):
        with pytest.raises(kral.FileError) as failure:
            call()
        assert failure.value.status not in (None, 0)


# Which outcome a fault becomes: the exception, and the status that it carries.
OUTCOMES = [
    ("refuse=20,of=0C", lambda phone: phone.request(b"\x0c", 0.3), kral.Refused, 20),
    ("ignore,of=0C", lambda phone: phone.request(b"\x0c", 0.1), kral.NoAnswer, None),
    ("wrong=99,of=0C", lambda phone: phone.request(b"\x0c", 0.3), kral.LinkError, 99),
    ("hang-up,of=0C", lambda phone: phone.request(b"\x0c", 0.5), kral.Lost, None),
    ("split=1,of=FF", lambda phone: phone.files.get("/none"), kral.FileError, 2),
    ("split=1,of=FF", lambda phone: phone.nv.read(60000), kral.Refused, None),
    ("split=1,of=FF", lambda phone: phone.files.put(pathlib.Path("/none"), "/x"), kral.BadFile, None),
]


@pytest.mark.parametrize("fault, call, kind, status", OUTCOMES)
def test_failures_are_exceptions_by_outcome(request, fault, call, kind, status):
    request.node.add_marker(pytest.mark.handset(faults=[fault]))
    phone = request.getfixturevalue("phone")
    with pytest.raises(kral.KralError) as failure:
        call(phone)
    assert type(failure.value) is kind, failure.value
    assert failure.value.record is not None and failure.value.record.function.startswith("KRAL_")
    if status is not None:
        assert failure.value.status == status


@pytest.mark.parametrize("call", [
    lambda phone: phone.nv.write(65536 + 453, b"\1"),
    lambda phone: phone.nv.read(-1),
    lambda phone: phone.nv.write(453, "abc"),
    lambda phone: phone.nv.write(453, b"\1" * 65537),
    lambda phone: phone.request("abc"),
    lambda phone: phone.ftm.set_channel(65536 + 9750),
    lambda phone: setattr(phone, "mode", 99),
    lambda phone: phone.files.remove("/a\0b"),
    lambda phone: phone.files.put(b"", "/a\0b"),
    lambda phone: phone.backup("x.pkv", items=range(0, 200, 50)),
    lambda phone: phone.backup("x.pkv", items=range(0)),
    lambda phone: next(phone.events([65536 + 5], timeout=0)),
    lambda phone: kral.flash(255, __file__, [(256, __file__)]),
    lambda phone: kral.connect(65536 + phone.port),
    lambda phone: kral.connect(-1),
    lambda phone: kral.connect(1.0),
    lambda phone: kral.Job().mode(2.5),
    lambda phone: phone.request(b"\0", float("inf")),
    lambda phone: bands.get("x"),
    lambda phone: kral.image_info(__file__ + "\0"),
    lambda phone: kral.flash(255, __file__ + "\0", [__file__]),
    lambda phone: kral.flash(255, __file__, [__file__ + "\0.bin"]),
])
def test_what_c_would_cut_is_refused(phone, call):
    with pytest.raises(kral.BadArgument):
        call(phone)
    phone.identity  # nothing was sent, and no other connection was closed


@pytest.mark.parametrize("words", [
    array.array("H", [0x0102] * 64),
    memoryview(array.array("H", [0x0102] * 64)),
    memoryview(array.array("H", [0x0102, 0] * 64))[::2],
    (ctypes.c_uint16 * 64)(*[0x0102] * 64),
], ids=["array", "view", "every second", "ctypes"])
def test_all_bytes_of_wider_elements_are_sent(phone, words):
    phone.nv.write(453, words)
    assert phone.nv.read(453) == b"\2\1" * 64
    for write, path in ((phone.files.put, "/file"), (phone.files.put_item, "/item")):
        write(words, path)
        assert phone.files.get(path) == b"\2\1" * 64
    assert phone.request((ctypes.c_uint16 * 2)(0x0F4B, 0))[:4] == b"\x4b\x0f\0\0"
    with phone.ftm.active():
        assert phone.ftm.send_id(902, words) == b"\2\1" * 64


def test_connects_that_fail(handset):
    with pytest.raises(kral.NoPort):
        kral.connect(255)
    with kral.connect(handset.port) as phone:
        assert phone.is_connected
    with pytest.raises(kral.BadArgument):
        phone.identity
    handset.end()
    with pytest.raises(kral.NoPort):
        kral.connect(handset.port, wait=0.15)


class Station:
    """One that is told by its own phone."""

    def __init__(self, port):
        self.phone = kral.connect(port)
        self.phone.text_log(line=self.line)

    def line(self, text):
        self.last = text


def test_a_forgotten_phone_lets_go_of_its_port(handset):
    station = Station(handset.port)
    handle = station.phone.handle
    station.phone.identity
    assert "DIAG_READ_ESN" in station.last
    del station
    gc.collect()
    assert kral.api().KRAL_GetTimeOut(handle, 0) == 0  # the handle is unknown


@pytest.mark.handset(files={"/nv/item_files/conf/a": b"1"})
def test_backup_restore_verify(phone, tmp_path):
    phone.nv.write(453, b"\x01")
    file, told = tmp_path / "phone.pkv", []
    result = phone.backup(file, progress=lambda done, total, item: told.append((done, total)), items=range(440, 460))
    assert result.done >= 2 and told[-1] == (result.total, result.total) and file.exists()
    phone.nv.write(453, b"\x00")
    with pytest.raises(kral.Mismatch) as failure:
        phone.verify(file)
    assert [item.id for item in failure.value.result.items] == [453]
    assert phone.restore(file).refused == 0
    assert phone.verify(file).different == 0
    with pytest.raises(kral.BadFile):
        phone.restore(tmp_path / "none.pkv")


@pytest.mark.handset("--esn", "0x10")
def test_job_on_many_handsets(phone, handset, tmp_path):
    file, told = tmp_path / "phone.pkv", []
    phone.backup(file, items=range(440, 460))
    with kral.sim.SimulatedHandset(199, "--esn", "0x20", "--fault", "refuse=20,of=29") as second:
        job = kral.Job(retries=0)
        job.mode(kral.Mode.OFFLINE)
        job.restore(file)
        job.verify(file)
        verdicts = {verdict.serial: verdict for verdict in job.run([phone, second.port], told.append)}
        passed, failed = verdicts["00000010"], verdicts["00000020"]
        assert passed.passed and passed.error is None and passed.port == handset.port
        assert failed.progress.step.startswith("mode") and isinstance(failed.error, kral.Refused) and failed.port == 199
        assert {progress.port for progress in told} == {handset.port, 199} and phone.mode == kral.Mode.OFFLINE
        # What is wrong is raised before anything is sent, and a job that is left ends.
        with pytest.raises(kral.NoPort):
            job.run([phone, 255])
        for _ in job.run([phone, second.port]):
            break
        job.verify(tmp_path / "none.pkv")
        with pytest.raises(kral.BadFile):
            job.run([phone])
    assert phone.identity.serial == 0x10


def test_backups_on_one_port_have_extents_of_their_own(phone, tmp_path):
    with ThreadPoolExecutor(2) as threads:
        first = []

        def others(done, total, item):
            for count in () if first else (10, 20):
                first.append(threads.submit(phone.backup, tmp_path / str(count), items=range(count)))
                time.sleep(0.05)

        totals = [phone.backup(tmp_path / "long", progress=others, items=range(300)).total]
        totals += [backup.result().total for backup in first]
    files = phone.backup(tmp_path / "one", items=range(1)).total - 1
    assert [total - files for total in totals] == [300, 10, 20]


def test_the_end_of_another_phone_on_the_port_leaves_progress_alone(phone, tmp_path):
    phone.nv.write(453, b"\x01")
    told = []

    def end_another(done, total, item):
        if not told:
            other.close()
        told.append(done)

    other = kral.connect(phone.port)
    other.backup(tmp_path / "x.pkv", items=range(453, 454))  # has configured callbacks, too
    result = phone.backup(tmp_path / "x.pkv", progress=end_another, items=range(440, 460))
    assert told[-1] == result.total and len(told) > 10


# A progress function runs while its work has the handset: what would wait for the end of that is refused.
@pytest.mark.parametrize("use", [
    lambda phone: phone.files.listdir("/"),
    lambda phone: phone.backup("x.pkv"),
    lambda phone: phone.nv.read(0),
    lambda phone: next(phone.events(timeout=1)),
    lambda phone: kral.connect(phone.port),
    lambda phone: kral.flash(phone.port, __file__, [__file__]),
    lambda phone: phone.close(),
], ids=["listdir", "backup", "nv", "events", "connect", "flash", "close"])
def test_a_progress_function_cannot_use_its_phone(phone, use):
    refused = []

    def progress(done, total):
        with pytest.raises(kral.BadArgument, match="progress function") as failure:
            use(phone)
        refused.append(failure)

    phone.files.put(bytes(5000), "/x", progress=progress)
    assert refused and phone.files.get("/x") == bytes(5000)


def test_an_exception_in_progress_ends_the_work(phone, tmp_path):
    calls = []

    def stop(done, total, item):
        calls.append(threading.current_thread())
        raise ZeroDivisionError

    with pytest.raises(ZeroDivisionError):
        phone.backup(tmp_path / "x.pkv", progress=stop)
    assert calls == [threading.current_thread()]
    assert phone.identity.serial


@pytest.mark.handset("--logs", "200", "--events", "200")
def test_logs_and_events(phone, handset):
    codes = [packet.code for packet, _ in zip(phone.logs([0x1001, 0x1003]), range(20))]
    assert set(codes) == {0x1001, 0x1003}
    assert [event.id for event, _ in zip(phone.events([3, 4]), range(4))] == [3, 4, 3, 4]
    start = time.monotonic()
    assert list(phone.events([], timeout=0.1)) == [] and time.monotonic() - start < 5
    handset.end()
    with pytest.raises(kral.Lost):
        for _ in phone.logs([], timeout=30):
            pass


@pytest.mark.handset(faults=["ignore,of=0C"])
def test_a_call_leaves_the_interpreter_free(phone):
    counted = []
    stop = threading.Event()

    def count():
        while not stop.wait(0.01):
            counted.append(1)

    thread = threading.Thread(target=count)
    thread.start()
    with pytest.raises(kral.NoAnswer):
        phone.request(b"\x0c", 0.4)
    stop.set()
    thread.join()
    assert len(counted) > 5


@pytest.mark.handset("--boot-loader")
def test_flash_from_cold(handset, tmp_path):
    programmer, image, told = tmp_path / "programmer.bin", tmp_path / "software.bin", []
    programmer.write_bytes(b"VHFP" + struct.pack("<I", 30000) + bytes(29992))
    image.write_bytes(b"VHSW" + b"VHS-2.0.1\0" + bytes(range(256)) * 80)
    kral.flash(handset.port, programmer, [(2, image)], progress=lambda done, total: told.append((done, total)))
    assert told[-1][0] == told[-1][1] == 30000 + image.stat().st_size
    assert kral.image_info(image).regions == ((0, image.stat().st_size),)
    with pytest.raises(kral.BadFile):
        kral.flash(handset.port, programmer, [tmp_path / "none"])


def test_bands():
    assert bands.uplink(1, 60) == 902.0 and bands.downlink(1, 60) == 947.0 and bands.uplink(1, 200) is None
    assert bands.get(1).uplink == ((1, 124),)
    assert len(bands.all()) > 80
    with pytest.raises(KeyError):
        bands.get(99)


def test_the_text_log_goes_to_the_functions_of_all_phones_on_the_port(phone):
    lines, others = [], []
    phone.text_log(line=lines.append)
    with kral.connect(phone.port) as second:
        assert second.handle == phone.handle
        second.text_log(line=others.append)
        second.identity
        assert any("KRAL_DIAG_VERNO_F" in line for line in lines)
        assert [line for line in others if "KRAL_DIAG" in line] == [line for line in lines if "KRAL_DIAG" in line]
    counts = len(lines), len(others)
    phone.identity
    assert len(lines) > counts[0] and len(others) == counts[1]
    with pytest.raises(kral.BadFile):
        phone.text_log("/none/log.txt")
    phone.text_log()
    count = len(lines)
    phone.identity
    assert len(lines) == count


@pytest.mark.parametrize("other", [
    lambda phone: phone.text_log(line=lambda text: None),
    lambda phone: phone.text_log(flags=0, line=lambda text: None),
    lambda phone: phone.text_log(),
    lambda phone: pytest.raises(kral.BadArgument, phone.text_log, os.devnull),
    lambda phone: phone.close(),
], ids=["lines", "no categories", "neither", "file", "close"])
def test_another_phone_on_the_port_leaves_the_text_log_alone(phone, tmp_path, other):
    file, lines = tmp_path / "log.txt", []
    with kral.connect(phone.port) as second:
        phone.text_log(file, line=lines.append)
        other(second)
        before = file.stat().st_size, len(lines)
        phone.identity
        assert file.stat().st_size > before[0] and len(lines) > before[1]
    phone.identity
    with kral.connect(phone.port) as second:
        phone.text_log(line=lines.append)
        second.text_log(file, flags=_api.KRAL_LOG_FN)
    before, count = file.stat().st_size, len(lines)
    phone.identity  # its file has ended with the other phone
    assert file.stat().st_size == before and len(lines) > count
