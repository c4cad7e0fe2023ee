  /// <summary>The part of Kral.cs that is written by hand: connections, failures, texts.</summary>
  public static class Kral {
    /// <summary>The text in a buffer that the library has filled: UTF-8, up to its zero.</summary>
    public static string Text(byte[] buffer) {
      int end = Array.IndexOf(buffer, (byte)0);
      return Encoding.UTF8.GetString(buffer, 0, end < 0 ? buffer.Length : end);
    }

    /// <summary>The text behind a pointer that a callback is given; null for none.</summary>
    public static string Text(IntPtr text) {
      if (text == IntPtr.Zero) return null;
      int length = 0;
      while (Marshal.ReadByte(text, length) != 0) ++length;
      return Encoding.UTF8.GetString(Bytes(text, (uint)length));
    }

    /// <summary>The bytes behind a pointer that a callback is given.</summary>
    public static byte[] Bytes(IntPtr data, uint length) {
      byte[] copy = new byte[length];
      if (length != 0) Marshal.Copy(data, copy, 0, (int)length);
      return copy;
    }

    /// <summary>Refuses an array that is shorter than the function is told. Null is the function's matter.</summary>
    internal static void Fits(Array array, long needed, string name) {
      if (array == null || array.LongLength >= needed) return;
      throw new ArgumentException("an array of " + array.Length + " elements where there must be " + needed, name);
    }

    /// <summary>Refuses a text that C would take for a shorter one; gives any other.</summary>
    internal static string Whole(string text, string name) {
      if (text != null && text.IndexOf('\0') >= 0) throw new ArgumentException("a text with a zero in it", name);
      return text;
    }

    /// <summary>The version of the library in use, such as 6.0.29.</summary>
    public static Version LibraryVersion {
      get {
        uint number = Native.KRAL_GetLibraryVersionNumber();
        return new Version((int)(number >> 16), (int)(number >> 8 & 255), (int)(number & 255));
      }
    }
  }

  /// <summary>A call failed. Code is one of the KRAL_ERROR_ constants; Record has all that the library kept.</summary>
  public sealed class KralException : Exception {
    public KralException(string function, string text, KRAL_ERROR record) : base(text) {
      Function = function;
      Record = record;
    }

    public string Function { get; private set; }
    public KRAL_ERROR Record { get; private set; }
    public int Code { get { return (int)Record.code; } }

    /// <summary>What the handset itself said; null when it said nothing.</summary>
    public uint? Status { get { return Record.status_kind == 0 ? (uint?)null : Record.status; } }

    /// <summary>The exception for a failed call: its record, unless that is another call's.</summary>
    internal static KralException Of(uint handle, string function) {
      KRAL_ERROR record = new KRAL_ERROR();
      bool known = Native.KRAL_GetLastError(handle, out record) != 0 && Kral.Text(record.function) == function;
      return known ? new KralException(function, Kral.Text(record.text), record)
                   : new KralException(function, function + " failed", new KRAL_ERROR { code = Native.KRAL_ERROR_INTERNAL });
    }
  }

  /// <summary>A connect of the library. It is released when it is disposed of, or collected.</summary>
  public sealed class KralHandle : SafeHandle {
    // The library may be inside a delegate that has been replaced, and connects to one port share their handle: what a
    // handle was given is let go of with its last connect.
    private sealed class Delegates : List<Delegate> {
      internal int Connects;
    }
    private static readonly Dictionary<uint, Delegates> kept = new Dictionary<uint, Delegates>();

    internal KralHandle(uint value) : base(IntPtr.Zero, true) {
      lock (kept) {
        Delegates own;
        if (!kept.TryGetValue(value, out own)) kept[value] = own = new Delegates();
        ++own.Connects;
      }
      SetHandle((IntPtr)(long)value);
    }

    public override bool IsInvalid { get { return handle == IntPtr.Zero; } }
    internal uint Value { get { return (uint)(long)handle; } }
    protected override bool ReleaseHandle() {
      Native.KRAL_DisconnectServer(Value);
      lock (kept) {
        if (--kept[Value].Connects == 0) kept.Remove(Value);
      }
      return true;
    }

    internal void Keep(Delegate callback) {
      lock (kept) kept[Value].Add(callback);
    }
  }

  /// <summary>A handset on a port. Delegates that it is given live as long as the connection.</summary>
  public sealed partial class Phone : IDisposable {
    private readonly KralHandle handle;

    private Phone(uint value) { handle = new KralHandle(value); }

    /// <summary>Connects to the handset on a COM port. Fails when none answers.</summary>
    public static Phone Connect(uint port) {
      Native.KRAL_SetDefaultReceiveMode((byte)Native.KRAL_RECEIVE_MODE_WAKE);
      uint value = Native.KRAL_ConnectServer(port);
      if (value == 0) throw KralException.Of(0, "KRAL_ConnectServer");
      Phone phone = new Phone(value);
      if (phone.IsPhoneConnected()) return phone;
      KralException failure = KralException.Of(value, "KRAL_IsPhoneConnected");
      phone.Dispose();
      throw failure;
    }

    /// <summary>A handset in its boot loader: the port is left alone until Kivrat_Connect or Kivrat_FlashAll.</summary>
    public static Phone ConnectBootLoader(uint port) {
      uint value = Native.KRAL_Kivrat_ConnectServer(port);
      if (value == 0) throw KralException.Of(0, "KRAL_Kivrat_ConnectServer");
      return new Phone(value);
    }

    /// <summary>The handle, for Native.</summary>
    public uint Handle {
      get {
        if (handle.IsClosed) throw new ObjectDisposedException("Phone");
        return handle.Value;
      }
    }

    /// <summary>Ends the connection.</summary>
    public void Dispose() { handle.Dispose(); }

    private void Keep(Delegate callback) {
      if (callback != null) handle.Keep(callback);
    }

    private void Check(byte result, string function) {
      if (result == 0) throw KralException.Of(Handle, function);
    }

    private void CheckCode(uint code, string function) {
      if (code == 0) return;
      KralException failure = KralException.Of(Handle, function);
      if (failure.Code != Native.KRAL_ERROR_INTERNAL) throw failure;
      byte[] text = new byte[128];
      Native.KRAL_NV_GetErrorText(0, code, text, (uint)text.Length);
      KRAL_ERROR record = failure.Record;
      record.status_kind = (uint)Native.KRAL_ERROR_STATUS_RESULT;
      record.status = code;
      throw new KralException(function, function + ": " + Kral.Text(text), record);
    }

    private bool Answer(byte result) {
      GC.KeepAlive(this);
      return result != 0;
    }

    private T Value<T>(T result) {
      GC.KeepAlive(this);
      return result;
    }
  }

  /// <summary>What became of a handset of a job. Error is why it did not pass, Step where.</summary>
  public sealed class Verdict {
    internal Verdict(KRAL_VENTRIMS_RESULT result) {
      Progress = result.progress;
      if (result.passed == 0) {
        Error = new KralException(Kral.Text(result.error.function), Kral.Text(result.error.text), result.error);
      }
    }

    public KRAL_VENTRIMS_PROGRESS Progress { get; private set; }
    public KralException Error { get; private set; }
    public bool Passed { get { return Error == null; } }
    public uint Port { get { return Progress.port; } }
    public string Serial { get { return Kral.Text(Progress.serial); } }
    public string Model { get { return Kral.Text(Progress.model); } }
    public string Step { get { return Kral.Text(Progress.step_name); } }
  }

  /// <summary>The same work for many handsets at once: steps, handsets, one Run. Dispose aborts what still runs.</summary>
  public sealed class Job : IDisposable {
    private const uint LookMs = 100;
    private readonly List<Phone> phones = new List<Phone>();  // which must live as long
    private uint job;
    private uint handsets;

    /// <summary>EnterLoader: handsets are in diagnostics before a download. Reset: and are restarted after it.</summary>
    public Job(bool enterLoader = false, bool reset = false, uint atOnce = 0, uint retries = 2) {
      job = Native.KRAL_VENTRIMS_Create();
      if (job == 0) throw KralException.Of(0, "KRAL_VENTRIMS_Create");
      KRAL_VENTRIMS_OPTIONS options = new KRAL_VENTRIMS_OPTIONS();
      options.size = (uint)Marshal.SizeOf(options);
      Check(Native.KRAL_VENTRIMS_GetOptions(job, ref options), "KRAL_VENTRIMS_GetOptions");
      options.flags = (enterLoader ? (uint)Native.KRAL_VENTRIMS_ENTER_LOADER : 0) |
                      (reset ? (uint)Native.KRAL_VENTRIMS_RESET : 0);
      options.at_once = atOnce;
      options.retries = retries;
      Check(Native.KRAL_VENTRIMS_SetOptions(job, ref options), "KRAL_VENTRIMS_SetOptions");
    }

    ~Job() { Dispose(); }

    public void Dispose() {
      uint own = job;
      job = 0;
      if (own != 0) Native.KRAL_VENTRIMS_Free(own);
      GC.SuppressFinalize(this);
    }

    /// <summary>Loads a flash programmer: by the loader (HEX), or with the boot transfer.</summary>
    public void AddProgrammer(string file, bool isHex) {
      uint kind = (uint)(isHex ? Native.KRAL_VENTRIMS_PROGRAMMER_HEX : Native.KRAL_VENTRIMS_PROGRAMMER_BOOT);
      Check(Native.KRAL_VENTRIMS_AddProgrammer(job, Kral.Whole(file, "file"), kind), "KRAL_VENTRIMS_AddProgrammer");
    }

    public void AddPartitionTable(string file, bool replace = false) {
      byte result = Native.KRAL_VENTRIMS_AddPartitionTable(job, Kral.Whole(file, "file"), (byte)(replace ? 1 : 0));
      Check(result, "KRAL_VENTRIMS_AddPartitionTable");
    }

    public void AddImage(string file, byte type = 0, string header = null) {
      const uint format = (uint)Native.KRAL_IMAGE_FORMAT_BY_CONTENT;
      const byte method = (byte)Native.KRAL_STREAM_MULTI_IMAGE;
      Kral.Whole(header, "header");
      byte result = Native.KRAL_VENTRIMS_AddImage(job, Kral.Whole(file, "file"), format, type, header, method);
      Check(result, "KRAL_VENTRIMS_AddImage");
    }

    public void AddIdentity() { Check(Native.KRAL_VENTRIMS_AddIdentity(job), "KRAL_VENTRIMS_AddIdentity"); }
    public void AddMode(uint mode) { Check(Native.KRAL_VENTRIMS_AddMode(job, mode), "KRAL_VENTRIMS_AddMode"); }
    public void AddRestore(string file) {
      Check(Native.KRAL_VENTRIMS_AddRestore(job, Kral.Whole(file, "file")), "KRAL_VENTRIMS_AddRestore");
    }

    public void AddVerify(string file) {
      Check(Native.KRAL_VENTRIMS_AddVerify(job, Kral.Whole(file, "file")), "KRAL_VENTRIMS_AddVerify");
    }

    /// <summary>The handset on a COM port.</summary>
    public void Add(uint port) {
      uint number;
      Check(Native.KRAL_VENTRIMS_AddPort(job, port, out number), "KRAL_VENTRIMS_AddPort");
      ++handsets;
    }

    /// <summary>A handset that is connected.</summary>
    public void Add(Phone phone) {
      uint number;
      Check(Native.KRAL_VENTRIMS_AddHandle(job, phone.Handle, out number), "KRAL_VENTRIMS_AddHandle");
      phones.Add(phone);
      ++handsets;
    }

    /// <summary>Ends the work on all handsets, from any thread.</summary>
    public void Abort() {
      Check(Native.KRAL_VENTRIMS_Abort(job, Native.KRAL_VENTRIMS_ALL), "KRAL_VENTRIMS_Abort");
    }

    /// <summary>
    /// Looks at all files and ports, begins, and gives the verdicts as they come. progress is called on this thread,
    /// for each handset that works, ten times a second.
    /// </summary>
    public IEnumerable<Verdict> Run(Action<KRAL_VENTRIMS_PROGRESS> progress = null) {
      Check(Native.KRAL_VENTRIMS_Start(job), "KRAL_VENTRIMS_Start");
      return Verdicts(progress);
    }

    private IEnumerable<Verdict> Verdicts(Action<KRAL_VENTRIMS_PROGRESS> progress) {
      List<uint> waiting = new List<uint>();
      for (uint handset = 0; handset < handsets; ++handset) waiting.Add(handset);
      while (waiting.Count != 0) {
        Native.KRAL_VENTRIMS_Wait(job, LookMs);
        foreach (uint handset in waiting.ToArray()) {
          KRAL_VENTRIMS_PROGRESS now = new KRAL_VENTRIMS_PROGRESS();
          now.size = (uint)Marshal.SizeOf(now);
          Check(Native.KRAL_VENTRIMS_GetProgress(job, handset, ref now), "KRAL_VENTRIMS_GetProgress");
          if (progress != null) progress(now);
          if (now.state < Native.KRAL_VENTRIMS_PASSED) continue;
          KRAL_VENTRIMS_RESULT result = new KRAL_VENTRIMS_RESULT();
          result.size = (uint)Marshal.SizeOf(result);
          Check(Native.KRAL_VENTRIMS_GetResult(job, handset, ref result), "KRAL_VENTRIMS_GetResult");
          waiting.Remove(handset);
          yield return new Verdict(result);
        }
      }
    }

    private void Check(byte result, string function) {
      if (job == 0) throw new ObjectDisposedException("Job");
      if (result == 0) throw KralException.Of(job, function);
    }
  }
