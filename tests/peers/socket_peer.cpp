// A remote end for the socket tests, in a process of its own:
//   socket_peer.exe <port> <delay ms> <text>
// connects to 127.0.0.1:<port>, waits <delay ms>, sends <text>, then echoes everything it receives until
// the other side closes. Exit code 0 on an orderly end.
#include <winsock2.h>
#include <ws2tcpip.h>

#include <cstdlib>
#include <cstring>

int main(int argc, char** argv)
{
    if (argc < 4)
        return 2;
    WSADATA data;
    if (::WSAStartup(MAKEWORD(2, 2), &data) != 0)
        return 3;
    SOCKET s = ::socket(AF_INET, SOCK_STREAM, IPPROTO_TCP);
    sockaddr_in to = {};
    to.sin_family = AF_INET;
    to.sin_port = ::htons(static_cast<u_short>(std::atoi(argv[1])));
    to.sin_addr.s_addr = ::htonl(INADDR_LOOPBACK);
    if (::connect(s, reinterpret_cast<sockaddr*>(&to), sizeof to) != 0)
        return 4;
    ::Sleep(static_cast<DWORD>(std::atoi(argv[2])));
    const int length = static_cast<int>(std::strlen(argv[3]));
    if (length > 0 && ::send(s, argv[3], length, 0) != length)
        return 5;
    char buffer[4096];
    for (;;)
    {
        const int n = ::recv(s, buffer, sizeof buffer, 0);
        if (n <= 0)
            break;
        if (::send(s, buffer, n, 0) != n)
            return 6;
    }
    ::closesocket(s);
    ::WSACleanup();
    return 0;
}
