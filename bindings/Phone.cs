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
