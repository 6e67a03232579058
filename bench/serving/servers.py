"""The servers that are measured, each on a free port of this machine, with the same number of workers."""
import os
import shutil
import signal
import socket
import subprocess
import time
import urllib.request

NGINX = shutil.which("nginx", path=os.environ.get("PATH", "") + ":/usr/sbin:/sbin")
IIPSRV = "/usr/lib/iipimage-server/iipsrv.fcgi"
MAPSERV = "/usr/lib/cgi-bin/mapserv"
QUALITY = 85


def free_port():
    with socket.socket() as probe:
        probe.bind(("127.0.0.1", 0))
        return probe.getsockname()[1]


def stop(process):
    process.send_signal(signal.SIGTERM)
    try:
        process.wait(15)
    except subprocess.TimeoutExpired:
        process.kill()
        process.wait()


class Serve:
    """zmcraster serve, without a log like its peers."""

    def __init__(self, tool, folder, workers, *options):
        self.process = subprocess.Popen(
            [tool, "serve", os.path.join(folder, "data"), "--port", "0", "--threads", str(workers),
             "-q", *options], stdout=subprocess.PIPE, text=True)
        self.url = self.process.stdout.readline().strip()
        assert self.url.startswith("http://"), "the server does not start"

    def stop(self):
        stop(self.process)
        assert self.process.returncode == 0, "the server did not end well"

    def numbers(self):
        return [self.process.pid]

    def resident(self):
        """MiB of memory that it has."""
        with open(f"/proc/{self.process.pid}/status", encoding="ascii") as status:
            line = next(line for line in status if line.startswith("VmRSS"))
        return int(line.split()[1]) / 1024


class Fcgi:
    """Processes that share one socket, as spawn-fcgi starts them."""

    def __init__(self, folder, name, command, workers, environment):
        self.path = os.path.join(folder, name + ".socket")
        if os.path.exists(self.path):
            os.remove(self.path)
        with socket.socket(socket.AF_UNIX) as listener:
            listener.bind(self.path)
            listener.listen(1024)
            os.chmod(self.path, 0o777)
            self.processes = [
                subprocess.Popen([command], stdin=listener, stdout=subprocess.DEVNULL,
                                 stderr=subprocess.DEVNULL, env={**os.environ, **environment})
                for _ in range(workers)]

    def numbers(self):
        return [process.pid for process in self.processes]

    def stop(self):
        for process in self.processes:
            stop(process)


def iipsrv(folder, workers):
    return Fcgi(folder, "iip", IIPSRV, workers,
                {"JPEG_QUALITY": str(QUALITY), "VERBOSITY": "0", "OMP_NUM_THREADS": "1",
                 "MAX_IMAGE_CACHE_SIZE": "0", "CORS": "*"})


LAYER = """  LAYER
    NAME {name}
    TYPE RASTER
    STATUS ON
    DATA "{path}"
    PROCESSING "CLOSE_CONNECTION=DEFER"
  END
"""


def mapserver(folder, workers, width, names):
    layers = "".join(LAYER.format(name=name, path=os.path.join(folder, "data", f"tiled_{name}.tif"))
                     for name in names)
    path = os.path.join(folder, "scene.map")
    with open(path, "w", encoding="ascii") as file:
        file.write(f"""MAP
  NAME scene
  SIZE 256 256
  EXTENT 0 0 {width} {width * 3 // 4}
  IMAGETYPE jpeg
  OUTPUTFORMAT
    NAME jpeg
    DRIVER AGG/JPEG
    MIMETYPE "image/jpeg"
    IMAGEMODE RGB
    EXTENSION jpg
    FORMATOPTION "QUALITY={QUALITY}"
  END
  WEB
  END
{layers}END
""")
    config = os.path.join(folder, "mapserver.conf")
    with open(config, "w", encoding="ascii") as file:
        file.write(f'CONFIG\n  ENV\n    MS_MAPFILE "{path}"\n  END\nEND\n')
    return Fcgi(folder, "map", MAPSERV, workers, {"MAPSERVER_CONFIG_FILE": config})


NGINX_CONF = """{user}worker_processes {workers};
daemon off;
pid {folder}/nginx.pid;
error_log stderr error;
events {{ worker_connections 4096; }}
http {{
  access_log off;
  sendfile on;
  tcp_nopush on;
  tcp_nodelay on;
  keepalive_requests 1000000000;
  open_file_cache max=100;
  types {{ text/html html; text/javascript js; text/css css; image/tiff tif; }}
  default_type application/octet-stream;
  client_body_temp_path {folder}/tmp/body; proxy_temp_path {folder}/tmp/proxy;
  fastcgi_temp_path {folder}/tmp/fcgi; uwsgi_temp_path {folder}/tmp/uwsgi;
  scgi_temp_path {folder}/tmp/scgi;
  fastcgi_buffers 16 64k;
  fastcgi_buffer_size 64k;
  server {{
    listen 127.0.0.1:{port} backlog=1024;
    location /data/ {{ root {folder}; add_header Cache-Control no-cache; }}
    location /pages/ {{ root {folder}; }}
    location = /iip {{ fastcgi_pass unix:{folder}/iip.socket; {parameters} }}
    location = /map {{ fastcgi_pass unix:{folder}/map.socket; {parameters} }}
  }}
}}
"""
PARAMETERS = " ".join(f"fastcgi_param {name} {value};" for name, value in (
    ("QUERY_STRING", "$query_string"), ("REQUEST_METHOD", "$request_method"),
    ("SCRIPT_NAME", "$uri"), ("REQUEST_URI", "$request_uri"), ("SERVER_NAME", "localhost"),
    ("SERVER_PORT", "$server_port"), ("SERVER_PROTOCOL", "$server_protocol"),
    ("HTTP_HOST", "$http_host"), ("REMOTE_ADDR", "$remote_addr")))


class Nginx:
    """Sends files by itself, and stands in front of the others."""

    def __init__(self, folder, workers):
        port = free_port()
        os.makedirs(os.path.join(folder, "tmp"), exist_ok=True)
        path = os.path.join(folder, "nginx.conf")
        with open(path, "w", encoding="ascii") as file:
            file.write(NGINX_CONF.format(folder=folder, port=port, workers=workers,
                                         parameters=PARAMETERS,
                                         user="user root;\n" if os.getuid() == 0 else ""))
        self.process = subprocess.Popen([NGINX, "-p", folder, "-c", path, "-e", "stderr"],
                                        stderr=subprocess.DEVNULL)
        self.url = f"http://127.0.0.1:{port}/"
        for _ in range(200):
            try:
                urllib.request.urlopen(self.url + "data/scene.pyr", timeout=5).close()
                return
            except OSError:
                time.sleep(0.05)
        raise RuntimeError("nginx does not start")

    def stop(self):
        stop(self.process)

    def numbers(self):
        return [self.process.pid]
