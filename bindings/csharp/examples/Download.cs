// Finds the receiver on a COM port and downloads one of its files; without a name it lists them:
//   Download COM7
//   Download COM7 LOG0801A.JPS copy.jps
using System;
using System.IO;
using System.Linq;
using System.Threading;
using Rcvlink;

static class Program
{
    // Told inside the transfer. Progress<int> of .NET tells other threads instead.
    sealed class Percent : IProgress<int>
    {
        public void Report(int percent)
        {
            Console.Write("\r{0,3} %", percent);
        }
    }

    static int Main(string[] arguments)
    {
        if (arguments.Length != 1 && arguments.Length != 3)
        {
            Console.WriteLine("usage: Download PORT [NAME FILE]");
            return 2;
        }
        using (var cancel = new CancellationTokenSource())
        {
            Console.CancelKeyPress += (sender, key) =>
            {
                key.Cancel = true;  // the program ends when the receiver is closed
                cancel.Cancel();
            };
            try
            {
                return Run(arguments, cancel.Token);
            }
            catch (OperationCanceledException)
            {
                Console.WriteLine("cancelled");
            }
            catch (RcvlinkException failure)
            {
                Console.WriteLine(failure.Message);
            }
            catch (IOException failure)
            {
                Console.WriteLine(failure.Message);
            }
            return 1;
        }
    }

    static int Run(string[] arguments, CancellationToken cancel)
    {
        using (Receiver receiver = Receiver.Find(arguments[0], cancel: cancel))
        {
            if (receiver == null)
            {
                Console.WriteLine("no receiver");
                return 1;
            }
            if (arguments.Length == 3) return Save(receiver, arguments[1], arguments[2], cancel);
            foreach (ReceiverFile file in receiver.ReadFiles(cancel))
            {
                Console.WriteLine("{0,10} {1}", file.Size, file.Name);
            }
            return 0;
        }
    }

    // The file of this computer is made when all bytes have come.
    static int Save(Receiver receiver, string name, string path, CancellationToken cancel)
    {
        ReceiverFile file = receiver.ReadFiles(cancel).FirstOrDefault(entry => entry.Name == name);
        if (file == null)
        {
            Console.WriteLine("the receiver has no such file");
            return 1;
        }
        using (var bytes = new MemoryStream())
        {
            receiver.Download(file, bytes, new Percent(), cancel);
            File.WriteAllBytes(path, bytes.ToArray());
        }
        Console.WriteLine(" saved");
        return 0;
    }
}
