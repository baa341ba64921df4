// Socket round trip: 64 bytes to an echoing thread and back over loopback, through CWSASocket::Send/
// Recv against raw send/recv on the same connection, interleaved in rounds so both see the same load.
#include "bench.h"

#include <ostrand/system/Socket.h>

#include <thread>
#include <vector>

namespace
{

void Echo(SOCKET s)
{
    char buffer[4096];
    for (;;)
    {
        const int n = ::recv(s, buffer, sizeof buffer, 0);
        if (n <= 0 || ::send(s, buffer, n, 0) != n)
            return;
    }
}

void ReceiveAll(SOCKET s, char* buffer, int size)
{
    for (int got = 0; got < size;)
    {
        const int n = ::recv(s, buffer + got, size - got, 0);
        if (n <= 0)
            return;
        got += n;
    }
}

} // namespace

BENCHMARK("socket/round trip")
{
    WSADATA wsa;
    ::WSAStartup(MAKEWORD(2, 2), &wsa);
    {
        ostrand::CWSASocket listener, client;
        listener.Create(AF_INET, SOCK_STREAM, IPPROTO_TCP);
        sockaddr_in a = {};
        a.sin_family = AF_INET;
        a.sin_addr.s_addr = ::htonl(INADDR_LOOPBACK);
        listener.BindLL(&a, sizeof a);
        listener.Listen(1);
        listener.GetSockNameLL(&a, sizeof a);
        client.Create(AF_INET, SOCK_STREAM, IPPROTO_TCP);
        client.ConnectLL(&a, sizeof a);
        ostrand::CWSASocket server(listener.AcceptLL(NULL, 0));
        const BOOL noDelay = TRUE;
        client.SetSockOptLL(IPPROTO_TCP, TCP_NODELAY, &noDelay, sizeof noDelay);
        server.SetSockOptLL(IPPROTO_TCP, TCP_NODELAY, &noDelay, sizeof noDelay);
        std::thread echo(Echo, static_cast<SOCKET>(server));

        char out[64] = {1, 2, 3};
        char in[64];
        const int trips = 2000;
        double wrapped = 1e300, raw = 1e300;
        for (int round = 0; round < 5; ++round)
        {
            raw = std::min(raw, bench::BestOf(1,
                                              [&]
                                              {
                                                  for (int i = 0; i < trips; ++i)
                                                  {
                                                      ::send(client, out, sizeof out, 0);
                                                      ReceiveAll(client, in, sizeof in);
                                                  }
                                              }));
            wrapped = std::min(wrapped,
                               bench::BestOf(1,
                                             [&]
                                             {
                                                 for (int i = 0; i < trips; ++i)
                                                 {
                                                     unsigned __int64 n = 0;
                                                     client.Send(out, sizeof out, n);
                                                     for (unsigned __int64 got = 0; got < sizeof in; got += n)
                                                     {
                                                         DWORD flags = 0;
                                                         client.Recv(in + got, sizeof in - got, n, flags);
                                                         if (n == 0)
                                                             break;
                                                     }
                                                 }
                                             }));
        }
        bench::Keep(in);
        std::printf("%d round trips of 64 bytes, best of 5 rounds: %.1f us per trip through CWSASocket\n",
                    trips, wrapped / trips * 1e6);
        bench::Report("CWSASocket Send/Recv round trips", wrapped, raw, "raw send/recv");
        client.Shutdown(SD_BOTH);
        echo.join();
    }
    ::WSACleanup();
}
