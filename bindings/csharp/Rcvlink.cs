// rcvlink for .NET on 64-bit Windows: the exported functions, and above them the class Receiver.
// Compile this file into the host program; rcvlink.dll belongs beside the program. The functions, their
// results and what they expect are described in rcvlink.h.
using System;
using System.Collections.Generic;
using System.ComponentModel;
using System.IO;
using System.Linq;
using System.Runtime.InteropServices;
using System.Runtime.InteropServices.ComTypes;
using System.Threading;
using Microsoft.Win32.SafeHandles;

namespace Rcvlink
{
    /// <summary>The kind of link to search on.</summary>
    public enum EInstanceType
    {
        /// <summary>The serial port of that name first, then the USB device of that name.</summary>
        eInstanceAny = 0,
        /// <summary>A serial port.</summary>
        eInstanceSerial = 1,
        /// <summary>A device of the USBIO driver.</summary>
        eInstanceUSB = 2
    }

    /// <summary>The family of receivers.</summary>
    public enum EProtocol
    {
        /// <summary>Quorin first, then Velmar.</summary>
        eProtocolAny = 0,
        /// <summary>Quorin.</summary>
        eProtocolQuorin = 1,
        /// <summary>Velmar.</summary>
        eProtocolVelmar = 2
    }

    /// <summary>A failed operation. <c>ErrorCode</c> is the result of the library: an HRESULT, or S_OK
    /// or S_FALSE where the library gives them for an operation that did not do what was asked.</summary>
    public sealed class RcvlinkException : ExternalException
    {
        /// <summary>Makes the exception of a result code.</summary>
        public RcvlinkException(string operation, int code, string reason)
            : base(string.Format("{0}: {1} (0x{2:X8})", operation, reason, code), code)
        {
        }

        internal RcvlinkException(string operation, int code) : this(operation, code, Result.TextOf(code))
        {
        }
    }

    /// <summary>The identity of a receiver.</summary>
    public sealed class ReceiverInfo
    {
        internal ReceiverInfo(ref CReceiverInfo record)
        {
            Id = Bstr.Read(record.bstrReceiverId);
            Model = Bstr.Read(record.bstrModel);
            Protocol = (EProtocol)record.dwProtocol;
            Variant = record.dwVariant;
        }

        /// <summary>The receiver's id.</summary>
        public string Id { get; private set; }
        /// <summary>The receiver's model.</summary>
        public string Model { get; private set; }
        /// <summary>The receiver's family.</summary>
        public EProtocol Protocol { get; private set; }
        /// <summary>Variant of the family, as rcvlink.h says.</summary>
        public uint Variant { get; private set; }
    }

    /// <summary>A file of a receiver.</summary>
    public sealed class ReceiverFile
    {
        internal ReceiverFile(ref CFileInfo record)
        {
            Name = Bstr.Read(record.bstrName);
            Size = record.dwSize;
            Time = record.stTime1.ToDateTime();
        }

        /// <summary>The name on the receiver.</summary>
        public string Name { get; private set; }
        /// <summary>The size in bytes.</summary>
        public uint Size { get; private set; }
        /// <summary>The time as the receiver gives it, of no known zone; null when it is unknown.</summary>
        public DateTime? Time { get; private set; }
    }

    /// <summary>A receiver. Its methods may be called from any thread; an operation waits until that of
    /// another thread has ended. Dispose closes the receiver after the operations that run.</summary>
    public sealed class Receiver : IDisposable
    {
        // The library's table of file lists has no lock.
        static readonly object fileLists = new object();

        readonly ReceiverHandle handle;
        // An abort that came when the operation had already ended is left for the next one.
        volatile bool abortMayBeLeft;

        Receiver(ReceiverHandle handle)
        {
            this.handle = handle;
            QuietLimit = TimeSpan.FromSeconds(60);
        }

        /// <summary>A download ends with ERROR_TIMEOUT when it brings no byte for so long: a receiver
        /// that falls silent may be asked again without end.</summary>
        public TimeSpan QuietLimit { get; set; }

        /// <summary>Finds the receiver on a port, such as COM7, or at the path of a USB device, which
        /// begins with two backslashes. Null: none answered. On a silent serial port that takes
        /// minutes.</summary>
        public static Receiver Find(string port,
                                    EProtocol protocol = EProtocol.eProtocolAny,
                                    CancellationToken cancel = default(CancellationToken))
        {
            if (port == null) throw new ArgumentNullException("port");
            cancel.ThrowIfCancellationRequested();
            var handle = new ReceiverHandle();
            IntPtr found = IntPtr.Zero;  // the search reads it
            bool isPath = port.StartsWith(@"\\", StringComparison.Ordinal);
            EInstanceType type = isPath ? EInstanceType.eInstanceUSB : EInstanceType.eInstanceSerial;
            int result;
            using (var ended = new AbortEvent(cancel))
            {
                result = NativeMethods.SearchReceiver(port, type, protocol, ended.Handle, ref found);
            }
            handle.Own(found);
            if (result == Result.False)
            {
                cancel.ThrowIfCancellationRequested();
                return null;
            }
            Result.Check("search", result);
            return new Receiver(handle);
        }

        /// <summary>Reads the identity.</summary>
        public ReceiverInfo ReadInfo(CancellationToken cancel = default(CancellationToken))
        {
            ReceiverInfo info = null;
            Execute("identity", cancel, raw => ReadIdentity(raw, out info));
            return info;
        }

        /// <summary>Whether the receiver still answers.</summary>
        public bool IsAnswering(CancellationToken cancel = default(CancellationToken))
        {
            short answer = 0;
            Execute("check", cancel, raw => NativeMethods.CheckConnection(raw, IntPtr.Zero, out answer));
            if (answer == 0) cancel.ThrowIfCancellationRequested();
            return answer != 0;
        }

        /// <summary>Reads the directory. A Velmar receiver that refuses or does not answer gives an empty
        /// one, and of a long one the first files, about 70.</summary>
        public IReadOnlyList<ReceiverFile> ReadFiles(CancellationToken cancel = default(CancellationToken))
        {
            var files = new List<ReceiverFile>();
            Execute("directory", cancel, raw => ReadDirectory(raw, files));
            return files;
        }

        /// <summary>Copies a file of the receiver into a stream, and checks that all of its bytes came. The
        /// progress, 0 to 100, is told on the calling thread, inside the transfer. After an exception the
        /// stream may have a part of the file.</summary>
        public void Download(ReceiverFile file,
                             Stream target,
                             IProgress<int> progress = null,
                             CancellationToken cancel = default(CancellationToken))
        {
            if (file == null) throw new ArgumentNullException("file");
            if (target == null) throw new ArgumentNullException("target");
            using (var quiet = new CancellationTokenSource())
            using (var transfer = new Transfer(target, progress, cancel, quiet, QuietLimit))
            {
                int result = Result.TimedOut;
                try
                {
                    result = Run(transfer.Cancel, raw => transfer.Run(raw, file));
                }
                catch (OperationCanceledException)
                {
                    // By the host, by its own code, or by a silence.
                    transfer.ThrowFailure();
                    cancel.ThrowIfCancellationRequested();
                }
                transfer.ThrowFailure();
                Result.Check("download", result);
                if (transfer.Bytes == file.Size) return;
                // Some failures give S_OK, also an abort after the speed was raised.
                cancel.ThrowIfCancellationRequested();
                int code = quiet.IsCancellationRequested ? Result.TimedOut : result;
                throw new RcvlinkException(
                    "download", code, string.Format("{0} of {1} bytes came", transfer.Bytes, file.Size));
            }
        }

        /// <summary>Deletes a file of the receiver.</summary>
        public void Delete(string name, CancellationToken cancel = default(CancellationToken))
        {
            if (name == null) throw new ArgumentNullException("name");
            using (HeldLock held = new HeldLock(handle, cancel))
            {
                Execute("delete", cancel, raw => NativeMethods.DeleteFileW(raw, name));
                // This family gives S_OK for a refusal as well.
                if (Family.Renames(held.Raw)) ThrowIfListed("delete", name, cancel);
            }
        }

        /// <summary>Renames a file of a Velmar receiver; no other family renames.</summary>
        public void Rename(string name, string newName, CancellationToken cancel = default(CancellationToken))
        {
            if (name == null) throw new ArgumentNullException("name");
            if (newName == null) throw new ArgumentNullException("newName");
            using (Lock(cancel))
            {
                Execute("rename", cancel, raw => NativeMethods.RenameFile(raw, name, newName));
                if (name != newName) ThrowIfListed("rename", name, cancel);
            }
        }

        /// <summary>Sets the speed of the receiver's own port.</summary>
        public void SetPortSpeed(uint bitsPerSecond, CancellationToken cancel = default(CancellationToken))
        {
            Execute("speed", cancel, raw => NativeMethods.DCSetRcvBaudrate(raw, bitsPerSecond));
        }

        /// <summary>Sets the parity of the receiver's own port. Quorin: 1 odd, 2 even. Velmar: 1 even,
        /// 2 odd. Any other value: none.</summary>
        public void SetPortParity(byte parity, CancellationToken cancel = default(CancellationToken))
        {
            Execute("parity", cancel, raw => NativeMethods.DCSetRcvParity(raw, parity));
        }

        /// <summary>Sets the RTS line of a Quorin receiver's own port.</summary>
        public void SetPortRts(bool on, CancellationToken cancel = default(CancellationToken))
        {
            Execute("RTS", cancel, raw => NativeMethods.DCSetRcvRTSControl(raw, (byte)(on ? 1 : 0)));
        }

        /// <summary>Sets the stop bits of the receiver's own port. Quorin: 0 for one, any other value for
        /// two. Velmar: their number.</summary>
        public void SetPortStopBits(byte stopBits, CancellationToken cancel = default(CancellationToken))
        {
            Execute("stop bits", cancel, raw => NativeMethods.DCSetRcvStopbits(raw, stopBits));
        }

        /// <summary>Keeps other threads out until the lock is disposed of, by the thread that took it: do
        /// not await in between.</summary>
        public IDisposable Lock(CancellationToken cancel = default(CancellationToken))
        {
            return new HeldLock(handle, cancel);
        }

        /// <summary>Closes the receiver.</summary>
        public void Dispose()
        {
            handle.Dispose();
        }

        void Execute(string what, CancellationToken cancel, Func<IntPtr, int> operation)
        {
            Result.Check(what, Run(cancel, operation));
        }

        // Runs an operation with the receiver locked, so that the abort of its token meets no other one.
        int Run(CancellationToken cancel, Func<IntPtr, int> operation)
        {
            using (HeldLock held = new HeldLock(handle, cancel))
            {
                if (abortMayBeLeft)
                {
                    abortMayBeLeft = false;
                    ReceiverInfo ignored;
                    ReadIdentity(held.Raw, out ignored);  // asks for nothing that changes the receiver
                }
                bool aborted = false;
                int result;
                Action abort = () =>
                {
                    aborted = true;
                    NativeMethods.Abort(held.Raw);
                };
                // The end of the registration waits for an abort that has begun.
                using (cancel.Register(abort))
                {
                    result = operation(held.Raw);
                }
                if (!aborted) return result;
                abortMayBeLeft = true;
                if (result != Result.Ok) throw new OperationCanceledException(cancel);
                return result;
            }
        }

        static int ReadIdentity(IntPtr raw, out ReceiverInfo info)
        {
            info = null;
            CReceiverInfo record = new CReceiverInfo();
            int result = NativeMethods.GetReceiverInfo(raw, IntPtr.Zero, ref record);
            try
            {
                if (result == Result.Ok) info = new ReceiverInfo(ref record);
            }
            finally
            {
                Marshal.FreeBSTR(record.bstrReceiverId);
                Marshal.FreeBSTR(record.bstrModel);
            }
            // A Quorin receiver stays locked once more after a failure. Of a Velmar receiver this would release
            // the lock of our caller.
            if (result != Result.Ok && !Family.Renames(raw)) NativeMethods.UnlockConnection(raw);
            return result;
        }

        static int ReadDirectory(IntPtr raw, List<ReceiverFile> files)
        {
            lock (fileLists)
            {
                IntPtr list = IntPtr.Zero;
                int result = NativeMethods.OpenFileList(raw, ref list);
                try
                {
                    if (result == Result.Ok) result = CopyFiles(list, files);
                }
                finally
                {
                    if (list != IntPtr.Zero) NativeMethods.CloseFileList(list);
                }
                return result;
            }
        }

        static int CopyFiles(IntPtr list, List<ReceiverFile> files)
        {
            int count;
            int result = NativeMethods.GetFilesCount(list, out count);
            for (int i = 0; i < count && result == Result.Ok; ++i)
            {
                CFileInfo record = new CFileInfo();
                result = NativeMethods.GetFileInfo(list, i, ref record);
                try
                {
                    if (result == Result.Ok) files.Add(new ReceiverFile(ref record));
                }
                finally
                {
                    Marshal.FreeBSTR(record.bstrName);
                }
            }
            return result;
        }

        void ThrowIfListed(string operation, string name, CancellationToken cancel)
        {
            if (ReadFiles(cancel).All(file => file.Name != name)) return;
            throw new RcvlinkException(operation, Result.Ok, "the file is still there");
        }
    }

    /// <summary>The report: a trace of the library in the user's temporary folder. Begin and end it while no
    /// other thread is in the library.</summary>
    public static class Report
    {
        /// <summary>Begins a report; a file of that name is overwritten.</summary>
        public static void Create(string name)
        {
            if (name == null) throw new ArgumentNullException("name");
            NativeMethods.CreateReportFileW(name);
        }

        /// <summary>Writes a line.</summary>
        public static void WriteLine(string text)
        {
            if (text == null) throw new ArgumentNullException("text");
            // The text is an argument: in a format, its percent signs would ask for arguments that are not
            // there. A va_list of 64-bit Windows is the address of slots of 8 bytes.
            IntPtr copy = Marshal.StringToHGlobalUni(text);
            IntPtr arguments = IntPtr.Zero;
            try
            {
                arguments = Marshal.AllocHGlobal(IntPtr.Size);
                Marshal.WriteIntPtr(arguments, copy);
                NativeMethods.DumpReportStringW("%ls\r\n", arguments);
            }
            finally
            {
                Marshal.FreeHGlobal(arguments);
                Marshal.FreeHGlobal(copy);
            }
        }

        /// <summary>Ends the report.</summary>
        public static void Close()
        {
            NativeMethods.CloseReportFile();
        }
    }

    static class Result
    {
        internal const int Ok = 0;
        internal const int False = 1;
        internal const int NotImplemented = unchecked((int)0x80004001);
        internal const int Failed = unchecked((int)0x80004005);
        internal const int NotConnected = unchecked((int)0x8007048F);
        internal const int TimedOut = unchecked((int)0x800705B4);
        internal const int FileTooLarge = unchecked((int)0x800700DF);

        const uint Win32Facility = 0x80070000;
        const uint FacilityMask = 0xFFFF0000;
        const int Win32Mask = 0xFFFF;

        internal static void Check(string operation, int code)
        {
            if (code != Ok) throw new RcvlinkException(operation, code);
        }

        internal static string TextOf(int code)
        {
            switch (code)
            {
                case False: return "ended early, without a result";
                case NotImplemented: return "this family of receivers does not support it";
                case Failed: return "empty file, or internal failure";
                case NotConnected: return "no connection, no complete reply, or refused";
                case TimedOut: return "no answer in time";
                case FileTooLarge: return "the file is too large";
            }
            bool ofWindows = ((uint)code & FacilityMask) == Win32Facility;
            return ofWindows ? new Win32Exception(code & Win32Mask).Message : "failed";
        }
    }

    static class Family
    {
        // Blocks of a Quorin file are numbered with 16 bits.
        internal const uint MostBytesOfQuorinFile = 33554432;

        // Only Velmar renames. Quorin answers so before it looks at the names, and nothing is asked of the
        // receiver.
        internal static bool Renames(IntPtr receiver)
        {
            return NativeMethods.RenameFile(receiver, null, null) != Result.NotImplemented;
        }
    }

    static class Bstr
    {
        internal static string Read(IntPtr text)
        {
            return text == IntPtr.Zero ? "" : Marshal.PtrToStringBSTR(text);
        }
    }

    // A receiver's handle, closed once.
    sealed class ReceiverHandle : SafeHandleZeroOrMinusOneIsInvalid
    {
        internal ReceiverHandle() : base(true)
        {
        }

        internal void Own(IntPtr found)
        {
            SetHandle(found);
        }

        protected override bool ReleaseHandle()
        {
            return NativeMethods.CloseReceiver(handle) >= 0;
        }
    }

    // The event of a token, kept open for a scope. It is manual-reset, as the library asks for.
    sealed class AbortEvent : IDisposable
    {
        readonly SafeWaitHandle handle;
        readonly bool held;

        internal AbortEvent(CancellationToken cancel)
        {
            // A token that is never cancelled needs no event.
            if (!cancel.CanBeCanceled) return;
            handle = cancel.WaitHandle.SafeWaitHandle;
            handle.DangerousAddRef(ref held);
        }

        internal IntPtr Handle
        {
            get { return held ? handle.DangerousGetHandle() : IntPtr.Zero; }
        }

        public void Dispose()
        {
            if (held) handle.DangerousRelease();
        }
    }

    // The library's lock of a receiver. It belongs to the thread, and counts.
    sealed class HeldLock : IDisposable
    {
        readonly ReceiverHandle handle;
        readonly int thread = Thread.CurrentThread.ManagedThreadId;
        bool held;

        internal HeldLock(ReceiverHandle handle, CancellationToken cancel)
        {
            cancel.ThrowIfCancellationRequested();
            this.handle = handle;
            int result;
            using (var ended = new AbortEvent(cancel))
            {
                // The receiver stays open as long as it is locked.
                handle.DangerousAddRef(ref held);
                result = NativeMethods.LockConnection(Raw, ended.Handle);
            }
            if (result == Result.Ok) return;
            // After the end of a thread that held the lock the result is a failure, and the lock is taken.
            if (result < 0) NativeMethods.UnlockConnection(Raw);
            held = false;
            handle.DangerousRelease();
            cancel.ThrowIfCancellationRequested();
            throw new RcvlinkException("lock", result);
        }

        // Stays valid until the unlock, also when another thread disposes of the receiver.
        internal IntPtr Raw
        {
            get { return handle.DangerousGetHandle(); }
        }

        public void Dispose()
        {
            if (!held) return;
            if (thread != Thread.CurrentThread.ManagedThreadId)
            {
                throw new SynchronizationLockException("only the thread that locked a receiver can unlock it");
            }
            held = false;
            NativeMethods.UnlockConnection(Raw);
            handle.DangerousRelease();
        }
    }

    // One download: the COM stream that takes the bytes, and the progress function. What the host's own code
    // throws inside is kept, and thrown when the library has returned.
    sealed class Transfer : IStream, IDisposable
    {
        readonly Stream target;
        readonly IProgress<int> progress;
        readonly CancellationTokenSource quiet;
        readonly TimeSpan quietLimit;
        readonly CancellationTokenSource ended;
        readonly ProgressFunction progressFunction;
        System.Runtime.ExceptionServices.ExceptionDispatchInfo failure;

        internal Transfer(Stream target,
                          IProgress<int> progress,
                          CancellationToken cancel,
                          CancellationTokenSource quiet,
                          TimeSpan quietLimit)
        {
            this.target = target;
            this.progress = progress;
            this.quiet = quiet;
            this.quietLimit = quietLimit;
            ended = CancellationTokenSource.CreateLinkedTokenSource(cancel, quiet.Token);
            progressFunction = Tell;
        }

        internal long Bytes { get; private set; }

        // Cancelled by the host, by a silence, or by a failure of the host's own code.
        internal CancellationToken Cancel
        {
            get { return ended.Token; }
        }

        internal int Run(IntPtr receiver, ReceiverFile file)
        {
            if (file.Size > Family.MostBytesOfQuorinFile && !Family.Renames(receiver)) return Result.FileTooLarge;
            quiet.CancelAfter(quietLimit);
            var record = new CProgressCallback
            {
                pfnProgress = Marshal.GetFunctionPointerForDelegate(progressFunction)
            };
            int result = NativeMethods.DownloadFile(receiver, file.Name, this, ref record);
            // Native code knows the delegate only by its address, which keeps nothing alive.
            GC.KeepAlive(progressFunction);
            return result;
        }

        internal void ThrowFailure()
        {
            if (failure != null) failure.Throw();
        }

        public void Dispose()
        {
            ended.Dispose();
        }

        void Tell(IntPtr context, byte percent)
        {
            if (progress == null || failure != null) return;
            try
            {
                progress.Report(percent);
            }
            catch (Exception thrown)
            {
                Fail(thrown);
            }
        }

        void Fail(Exception thrown)
        {
            failure = System.Runtime.ExceptionServices.ExceptionDispatchInfo.Capture(thrown);
            ended.Cancel();  // aborts; the progress function and the stream may do so
        }

        // The runtime makes a failing HRESULT of what a method of a COM object throws, so it does not reach
        // native code.
        void IStream.Write(byte[] pv, int cb, IntPtr pcbWritten)
        {
            try
            {
                if (failure == null) target.Write(pv, 0, cb);
            }
            catch (Exception thrown)
            {
                Fail(thrown);
            }
            if (failure != null) throw new COMException("the host's stream failed", Result.Failed);
            Bytes += cb;
            if (pcbWritten != IntPtr.Zero) Marshal.WriteInt32(pcbWritten, cb);
            quiet.CancelAfter(quietLimit);
        }

        // The library only writes. The exception's HRESULT is E_NOTIMPL.
        void IStream.Clone(out IStream ppstm)
        {
            throw new NotImplementedException();
        }

        void IStream.Commit(int grfCommitFlags)
        {
            throw new NotImplementedException();
        }

        void IStream.CopyTo(IStream pstm, long cb, IntPtr pcbRead, IntPtr pcbWritten)
        {
            throw new NotImplementedException();
        }

        void IStream.LockRegion(long libOffset, long cb, int dwLockType)
        {
            throw new NotImplementedException();
        }

        void IStream.Read(byte[] pv, int cb, IntPtr pcbRead)
        {
            throw new NotImplementedException();
        }

        void IStream.Revert()
        {
            throw new NotImplementedException();
        }

        void IStream.Seek(long dlibMove, int dwOrigin, IntPtr plibNewPosition)
        {
            throw new NotImplementedException();
        }

        void IStream.SetSize(long libNewSize)
        {
            throw new NotImplementedException();
        }

        void IStream.Stat(out System.Runtime.InteropServices.ComTypes.STATSTG pstatstg, int grfStatFlag)
        {
            throw new NotImplementedException();
        }

        void IStream.UnlockRegion(long libOffset, long cb, int dwLockType)
        {
            throw new NotImplementedException();
        }
    }

    [StructLayout(LayoutKind.Explicit, Size = 16)]
    struct RCVLINK_SYSTEMTIME
    {
        [FieldOffset(0)] internal ushort wYear;
        [FieldOffset(2)] internal ushort wMonth;
        [FieldOffset(4)] internal ushort wDayOfWeek;
        [FieldOffset(6)] internal ushort wDay;
        [FieldOffset(8)] internal ushort wHour;
        [FieldOffset(10)] internal ushort wMinute;
        [FieldOffset(12)] internal ushort wSecond;
        [FieldOffset(14)] internal ushort wMilliseconds;

        internal DateTime? ToDateTime()
        {
            try
            {
                return new DateTime(wYear, wMonth, wDay, wHour, wMinute, wSecond, wMilliseconds);
            }
            catch (ArgumentOutOfRangeException)
            {
                return null;  // unknown, which is all zero, or no date
            }
        }
    }

    [StructLayout(LayoutKind.Explicit, Size = 40)]
    struct CReceiverInfo
    {
        [FieldOffset(0)] internal uint dwFeatures;
        [FieldOffset(4)] internal uint dwPadding;
        [FieldOffset(8)] internal IntPtr bstrReceiverId;  // freed with Marshal.FreeBSTR
        [FieldOffset(16)] internal IntPtr bstrReserved;
        [FieldOffset(24)] internal IntPtr bstrModel;  // freed with Marshal.FreeBSTR
        [FieldOffset(32)] internal uint dwProtocol;
        [FieldOffset(36)] internal uint dwVariant;
    }

    [StructLayout(LayoutKind.Explicit, Size = 56)]
    struct CFileInfo
    {
        [FieldOffset(0)] internal uint dwSize;
        [FieldOffset(4)] internal uint dwPadding;
        [FieldOffset(8)] internal IntPtr bstrName;  // freed with Marshal.FreeBSTR
        [FieldOffset(16)] internal RCVLINK_SYSTEMTIME stTime1;
        [FieldOffset(32)] internal RCVLINK_SYSTEMTIME stTime2;
        [FieldOffset(48)] internal ulong qwReserved;
    }

    [StructLayout(LayoutKind.Explicit, Size = 16)]
    struct CProgressCallback
    {
        [FieldOffset(0)] internal IntPtr pfnProgress;
        [FieldOffset(8)] internal IntPtr pContext;
    }

    [UnmanagedFunctionPointer(CallingConvention.Winapi)]
    delegate void ProgressFunction(IntPtr context, byte percent);

    // The exported functions, by the names of Microsoft's compiler. Every result is an HRESULT, which the
    // runtime leaves as it is: S_FALSE counts. The DLL is looked for beside the program and among those of
    // Windows, and nowhere else.
    static class NativeMethods
    {
        const string Dll = "rcvlink.dll";
        const DllImportSearchPath Folders = DllImportSearchPath.AssemblyDirectory |
                                            DllImportSearchPath.ApplicationDirectory |
                                            DllImportSearchPath.System32;

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?SearchReceiver@devapi@@YAJPEA_WW4EInstanceType@@W4EProtocol@@PEAXPEAPEAX@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int SearchReceiver(
            [MarshalAs(UnmanagedType.LPWStr)] string port,
            EInstanceType type,
            EProtocol protocol,
            IntPtr abortEvent,
            ref IntPtr receiver);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?CreateReceiverOnSerial@devapi@@YAJPEA_WW4EProtocol@@PEAU_DCB@@PEAXPEAPEAX@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int CreateReceiverOnSerial(
            [MarshalAs(UnmanagedType.LPWStr)] string port,
            EProtocol protocol,
            IntPtr settings,
            IntPtr abortEvent,
            ref IntPtr receiver);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?CreateReceiverOnUSB@devapi@@YAJPEA_WW4EProtocol@@PEAXPEAPEAX@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int CreateReceiverOnUSB(
            [MarshalAs(UnmanagedType.LPWStr)] string device,
            EProtocol protocol,
            IntPtr abortEvent,
            ref IntPtr receiver);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?OpenReceiver@devapi@@YAJPEA_WPEAPEAX@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int OpenReceiver(
            [MarshalAs(UnmanagedType.LPWStr)] string port,
            ref IntPtr receiver);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?CloseReceiver@devapi@@YAJPEAX@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int CloseReceiver(IntPtr receiver);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?DestroyReceiver@devapi@@YAJPEA_W@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int DestroyReceiver([MarshalAs(UnmanagedType.LPWStr)] string port);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?GetReceiverInfo@devapi@@YAJPEAX0PEAUCReceiverInfo@@@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int GetReceiverInfo(
            IntPtr receiver,
            IntPtr abortEvent,
            ref CReceiverInfo info);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?CheckConnection@devapi@@YAJPEAX0PEAF@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int CheckConnection(
            IntPtr receiver,
            IntPtr abortEvent,
            out short answer);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?LockConnection@devapi@@YAJPEAX0@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int LockConnection(IntPtr receiver, IntPtr abortEvent);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?UnlockConnection@devapi@@YAJPEAX@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int UnlockConnection(IntPtr receiver);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?Abort@devapi@@YAJPEAX@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int Abort(IntPtr receiver);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?OpenFileList@devapi@@YAJPEAXPEAPEAX@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int OpenFileList(IntPtr receiver, ref IntPtr fileList);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?GetFilesCount@devapi@@YAJPEAXPEAJ@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int GetFilesCount(IntPtr fileList, out int count);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?GetFileInfo@devapi@@YAJPEAXJPEAUCFileInfo@@@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int GetFileInfo(IntPtr fileList, int index, ref CFileInfo info);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?CloseFileList@devapi@@YAJPEAX@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int CloseFileList(IntPtr fileList);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?DownloadFile@devapi@@YAJPEAXPEA_WPEAUIStream@@PEAUCProgressCallback@@@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int DownloadFile(
            IntPtr receiver,
            [MarshalAs(UnmanagedType.LPWStr)] string name,
            [MarshalAs(UnmanagedType.Interface)] IStream stream,
            ref CProgressCallback progress);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?UploadFile@devapi@@YAJPEAXPEBUCFileInfo@@PEAUIStream@@PEAUCProgressCallback@@@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int UploadFile(
            IntPtr receiver,
            ref CFileInfo info,
            [MarshalAs(UnmanagedType.Interface)] IStream stream,
            ref CProgressCallback progress);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?DeleteFileW@devapi@@YAJPEAXPEA_W@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int DeleteFileW(
            IntPtr receiver,
            [MarshalAs(UnmanagedType.LPWStr)] string name);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?RenameFile@devapi@@YAJPEAXPEA_W1@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int RenameFile(
            IntPtr receiver,
            [MarshalAs(UnmanagedType.LPWStr)] string oldName,
            [MarshalAs(UnmanagedType.LPWStr)] string newName);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?DCSetRcvBaudrate@devapi@@YAJPEAXK@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int DCSetRcvBaudrate(IntPtr receiver, uint baudRate);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?DCSetRcvParity@devapi@@YAJPEAXE@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int DCSetRcvParity(IntPtr receiver, byte parity);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?DCSetRcvRTSControl@devapi@@YAJPEAXE@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int DCSetRcvRTSControl(IntPtr receiver, byte rts);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?DCSetRcvStopbits@devapi@@YAJPEAXE@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int DCSetRcvStopbits(IntPtr receiver, byte stopBits);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?CreateReportFile@dump_hlp@@YAXPEBD@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern void CreateReportFileA([MarshalAs(UnmanagedType.LPStr)] string name);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?CreateReportFile@dump_hlp@@YAXPEB_W@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern void CreateReportFileW([MarshalAs(UnmanagedType.LPWStr)] string name);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?DumpReportString@dump_hlp@@YAXPEBDPEAD@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern void DumpReportStringA(
            [MarshalAs(UnmanagedType.LPStr)] string format,
            IntPtr arguments);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?DumpReportString@dump_hlp@@YAXPEB_WPEAD@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern void DumpReportStringW(
            [MarshalAs(UnmanagedType.LPWStr)] string format,
            IntPtr arguments);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?CloseReportFile@dump_hlp@@YAXXZ"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern void CloseReportFile();

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?SearchReceiverOnSerial@@YAJPEA_WW4EProtocol@@PEAXPEAPEAX@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int SearchReceiverOnSerial(
            [MarshalAs(UnmanagedType.LPWStr)] string port,
            EProtocol protocol,
            IntPtr abortEvent,
            ref IntPtr receiver);

        [DllImport(Dll, ExactSpelling = true, PreserveSig = true,
            EntryPoint = "?GetConnection@@YAJPEA_WW4EInstanceType@@PEAPEAVCIConnection@@@Z"),
         DefaultDllImportSearchPaths(Folders)]
        internal static extern int GetConnection(
            [MarshalAs(UnmanagedType.LPWStr)] string name,
            EInstanceType type,
            ref IntPtr connection);
    }
}
