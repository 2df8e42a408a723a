// Runs the class Receiver with the stand-in of stand_in.cpp. Prints what is not as expected; exit status 0: nothing.
using System;
using System.IO;
using System.Linq;
using System.Runtime.InteropServices;
using System.Threading;
using Rcvlink;

static class ReceiverTest
{
    enum Fault
    {
        None,
        Short,
        Silent,
        DeafToAbort,
        Refusing,
        NoIdentity
    }

    // Thrown by the host's own code, inside a transfer.
    sealed class HostException : Exception
    {
    }

    sealed class Progress : IProgress<int>
    {
        readonly Action<int> action;

        internal Progress(Action<int> action)
        {
            this.action = action;
        }

        public void Report(int percent)
        {
            action(percent);
        }
    }

    sealed class ThrowingStream : MemoryStream
    {
        public override void Write(byte[] buffer, int offset, int count)
        {
            throw new HostException();
        }
    }

    [DllImport("rcvlink.dll")] static extern void Arrange(EProtocol family, Fault fault);
    [DllImport("rcvlink.dll")] static extern int LocksOfThread();
    [DllImport("rcvlink.dll")] static extern int Closed();
    [DllImport("rcvlink.dll")] static extern int OpenLists();

    const int TimedOut = unchecked((int)0x800705B4);
    const int NotImplemented = unchecked((int)0x80004001);

    static EProtocol family;
    static Receiver receiver;
    static int mistakes;

    static int Main()
    {
        Expect("no receiver", Receiver.Find("COM9") == null);
        foreach (EProtocol each in new[] { EProtocol.eProtocolQuorin, EProtocol.eProtocolVelmar })
        {
            family = each;
            Arrange(family, Fault.None);
            using (receiver = Receiver.Find("COM7"))
            {
                Reads();
                Downloads();
                Fails();
                Cancels();
                Changes();
            }
            ClosesAfterTheOperation();
        }
        if (mistakes == 0) Console.WriteLine("the class Receiver does as expected");
        return mistakes == 0 ? 0 : 1;
    }

    static void Expect(string what, bool condition)
    {
        if (condition) return;
        ++mistakes;
        Console.WriteLine("{0}: {1}: not as expected", family, what);
    }

    // What an operation throws; afterwards no lock and no list is left.
    static Exception Thrown(Fault fault, Action operation)
    {
        Arrange(family, fault);
        Exception thrown = null;
        try
        {
            operation();
        }
        catch (Exception exception)
        {
            thrown = exception;
        }
        Expect("locks", LocksOfThread() == 0);
        Expect("lists", OpenLists() == 0);
        return thrown;
    }

    static bool HasCode(Exception thrown, int code)
    {
        var failure = thrown as RcvlinkException;
        return failure != null && failure.ErrorCode == code;
    }

    static ReceiverFile First
    {
        get { return receiver.ReadFiles().First(); }
    }

    static void Download(Stream stream,
                         Action<int> progress = null,
                         CancellationToken cancel = default(CancellationToken))
    {
        receiver.Download(First, stream, progress == null ? null : new Progress(progress), cancel);
    }

    static void Reads()
    {
        ReceiverInfo info = receiver.ReadInfo();
        Expect("identity", info.Id == "ID7" && info.Model == "M" && info.Protocol == family);
        Expect("answer", receiver.IsAnswering());
        Expect("directory", receiver.ReadFiles().Select(file => file.Name).SequenceEqual(new[] { "FIRST", "SECOND" }));
        Expect("time", First.Time == new DateTime(2024, 3, 9, 12, 30, 59, 7));
    }

    static void Downloads()
    {
        var bytes = new MemoryStream();
        int percent = 0;
        Expect("download", Thrown(Fault.None, () => Download(bytes, told => percent = told)) == null);
        Expect("bytes", bytes.Length == First.Size && percent == 100);
    }

    static void Fails()
    {
        Expect("a short file", HasCode(Thrown(Fault.Short, () => Download(new MemoryStream())), 0));
        Expect("its stream", Thrown(Fault.None, () => Download(new ThrowingStream())) is HostException);
        Expect("its progress", Thrown(Fault.None, () => Download(new MemoryStream(), told =>
        {
            throw new HostException();
        })) is HostException);
        Expect("the abort of it", receiver.ReadFiles().Count == 2);
        Expect("identity", HasCode(Thrown(Fault.NoIdentity, () => receiver.ReadInfo()), 1));
        Arrange(family, Fault.NoIdentity);
        using (receiver.Lock())
        {
            try
            {
                receiver.ReadInfo();
            }
            catch (RcvlinkException)
            {
                Expect("the host's own lock", LocksOfThread() == 1);
            }
        }
    }

    static void Cancels()
    {
        foreach (Fault fault in new[] { Fault.Silent, Fault.DeafToAbort })
        {
            var cancel = new CancellationTokenSource();
            Action download = () => Download(new MemoryStream(), told => cancel.CancelAfter(1), cancel.Token);
            Expect("cancelled", Thrown(fault, download) is OperationCanceledException);
            Expect("nothing left of it", receiver.IsAnswering());
            Exception thrown = Thrown(fault, () => receiver.ReadFiles(cancel.Token));
            Expect("before it began", thrown is OperationCanceledException);
        }
        receiver.QuietLimit = TimeSpan.FromMilliseconds(50);
        Expect("silence", HasCode(Thrown(Fault.Silent, () => Download(new MemoryStream())), TimedOut));
        receiver.QuietLimit = TimeSpan.FromSeconds(60);
        Expect("nothing left of it", receiver.IsAnswering());
    }

    static void Changes()
    {
        bool isVelmar = family == EProtocol.eProtocolVelmar;
        Expect("delete", Thrown(Fault.None, () => receiver.Delete("FIRST")) == null);
        Exception refusal = Thrown(Fault.Refusing, () => receiver.Delete("FIRST"));
        Expect("refused delete", isVelmar ? HasCode(refusal, 0) : refusal == null);
        Exception renaming = Thrown(Fault.None, () => receiver.Rename("FIRST", "THIRD"));
        Expect("rename", isVelmar ? renaming == null : HasCode(renaming, NotImplemented));
        refusal = Thrown(Fault.Refusing, () => receiver.Rename("FIRST", "THIRD"));
        Expect("refused rename", HasCode(refusal, isVelmar ? 0 : NotImplemented));
    }

    static void ClosesAfterTheOperation()
    {
        receiver = Receiver.Find("COM7");
        Exception thrown = Thrown(Fault.None, () => Download(new MemoryStream(), told =>
        {
            receiver.Dispose();
            Expect("open during the operation", Closed() == 0);
        }));
        Expect("the operation that ran", thrown == null);
        Expect("closed", Closed() == 1);
        Expect("the next one", Thrown(Fault.None, () => receiver.ReadInfo()) is ObjectDisposedException);
    }
}
