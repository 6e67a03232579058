"""Lets QGIS's own provider read a layer of a WMTS and draw it.

    qgis_wmts.py CAPABILITIES LAYER TILES SYSTEM PICTURE [WEST SOUTH EAST NORTH]

With an extent, 900 x 700 pixels of it; else the whole layer in 400 x 400.
"""
import sys

from qgis.core import (QgsApplication, QgsCoordinateReferenceSystem, QgsMapRendererSequentialJob,
                       QgsMapSettings, QgsRasterLayer, QgsRectangle)
from qgis.PyQt.QtCore import QSize

url, layer_name, tiles, system, picture, *extent = sys.argv[1:]
application = QgsApplication([], False)
application.initQgis()
layer = QgsRasterLayer(f"crs={system}&format=image/png&layers={layer_name}&styles=default"
                       f"&tileMatrixSet={tiles}&url={url}", layer_name, "wms")
if not layer.isValid():
    sys.exit("QGIS cannot open it: " + layer.error().message())
settings = QgsMapSettings()
settings.setDestinationCrs(QgsCoordinateReferenceSystem(system))
settings.setLayers([layer])
settings.setOutputSize(QSize(900, 700) if extent else QSize(400, 400))
settings.setExtent(QgsRectangle(*map(float, extent)) if extent else layer.extent())
settings.setFlag(QgsMapSettings.Antialiasing, False)
job = QgsMapRendererSequentialJob(settings)
job.start()
job.waitForFinished()
for error in job.errors():
    sys.exit("QGIS cannot draw it: " + error.message)
sys.exit(0 if job.renderedImage().save(picture) else "the picture is not written")
