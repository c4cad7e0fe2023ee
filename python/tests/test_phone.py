"""The package against a simulated handset."""
import gc
import os
import pathlib
import struct
import threading
import time
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


@pytest.mark.handset(files={"/a/b/one": b"1", "/a/two": b"22"})
def test_files(phone, tmp_path):
    files, told = phone.files, []
    assert [(path, [entry.name for entry in rest]) for path, _, rest in files.walk("/a")] == [
        ("/a", ["two"]), ("/a/b", ["one"])]
    data = bytes(range(256)) * 40
    files.put(data, "/a/big", progress=lambda done, total: told.append((done, total)))
    assert files.get("/a/big") == data and told[-1] == (len(data), len(data)) and len(told) > 3
    files.get("/a/big", to=tmp_path / "copy")
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
    files.put(b"1", odd + "/x")
    assert [path for path, _, _ in files.walk("/a/b")] == ["/a/b", odd] and files.get(odd + "/x") == b"1"
    with pytest.raises(kral.FileError) as failure:
        files.rmdir("/a/b")
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
    lambda phone: phone.files.remove("/a\0b"),
    lambda phone: phone.files.put(b"", "/a\0b"),
    lambda phone: phone.backup("x.pkv", items=range(0, 200, 50)),
    lambda phone: phone.backup("x.pkv", items=range(0)),
    lambda phone: kral.connect(65536 + phone.port),
    lambda phone: kral.connect(-1),
])
def test_what_c_would_cut_is_refused(phone, call):
    with pytest.raises(kral.BadArgument):
        call(phone)
    phone.identity  # nothing was sent, and no other connection was closed


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


def test_a_forgotten_phone_lets_go_of_its_port(handset):
    phone = kral.connect(handset.port)
    phone.text_log(line=lambda text: None)
    handle = phone.handle
    del phone
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


def test_the_text_log_goes_to_a_function(phone):
    lines = []
    phone.text_log(line=lines.append)
    phone.identity
    phone.text_log()
    count = len(lines)
    phone.identity
    assert any("KRAL_DIAG_VERNO_F" in line for line in lines) and len(lines) == count
