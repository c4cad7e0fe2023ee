// Station PORT: a small station in C#. Who is on the port, a backup with its progress, the channel set in factory test
// mode, and what a failure looks like.
using System;
using System.IO;
using KralLibrary;

static class Station {
  static int Main(string[] words) {
    if (words.Length != 1) {
      Console.Error.WriteLine("usage: Station PORT");
      return 2;
    }
    try {
      using (Phone phone = Phone.Connect(uint.Parse(words[0]))) Run(phone);
      return 0;
    } catch (KralException failure) {
      Console.Error.WriteLine("{0}: {1} (code {2})", failure.Function, failure.Message, failure.Code);
      return failure.Code;
    }
  }

  static void Run(Phone phone) {
    uint serial, hardware, number;
    byte[] software = new byte[Native.KRAL_BUILD_ID_TEXT_SIZE];
    byte[] model = new byte[Native.KRAL_BUILD_ID_TEXT_SIZE];
    phone.DIAG_READ_ESN_F(out serial);
    phone.DIAG_EXT_BUILD_ID_F(out hardware, out number, software, model);
    Console.WriteLine("{0} {1:X8} runs {2}, library {3}", Kral.Text(model), serial, Kral.Text(software), Kral.LibraryVersion);

    phone.ChangeFTM_ModeRuntime(1);
    phone.FTM_SET_MODE((ushort)Native.KRAL_FTM_RF_MODE_WCDMA);
    phone.FTM_SET_CHAN(9750);
    byte[] answer = new byte[64];
    ushort size = (ushort)answer.Length;
    phone.FTM_GET_RX_AGC(new byte[0], 0, answer, ref size);
    phone.ChangeFTM_ModeRuntime(0);
    Console.WriteLine("channel 9750 set, {0} bytes of gain", size);

    Backup(phone);

    try {
      phone.EfsRead(Path.GetTempFileName(), "/no/such/file");
      Console.WriteLine("read a file that is not there");
    } catch (KralException failure) {
      Console.WriteLine("no file: code {0}, status {1}", failure.Code, failure.Status);
    }
  }

  static void Backup(Phone phone) {
    string file = Path.GetTempFileName();
    uint status, seen = 0;
    phone.PKV_ConfigureBackup(0, 600, 1);
    phone.PKV_ConfigureCallBack((item, path, done, total, handle) => {
      seen = done;
      return 1;
    });
    phone.BackupNVFromMobileToPKV(file, out status);
    // What the collector moves meanwhile must not matter to callbacks of the library.
    GC.Collect();
    phone.PKV_Verify(file, out status);
    // The same comparison as a job, which takes as many handsets as there are.
    using (Job job = new Job()) {
      job.AddVerify(file);
      job.Add(phone);
      foreach (Verdict verdict in job.Run()) {
        Console.WriteLine("job: {0} {1}, {2}", verdict.Serial, verdict.Passed ? "passed" : verdict.Error.Message, verdict.Step);
      }
    }
    KRAL_PKV_COUNTS counts;
    phone.PKV_GetCounts(out counts);
    Console.WriteLine("backup of {0} items, {1} equal, callback saw {2}", counts.total, counts.done, seen);
    File.Delete(file);
  }
}
