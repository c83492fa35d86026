<?xml version="1.0"?>
<!-- Marks every method as answered later and from any thread, for the generated adaptors. -->
<xsl:stylesheet version="1.0" xmlns:xsl="http://www.w3.org/1999/XSL/Transform">
  <xsl:template match="@*|node()">
    <xsl:copy><xsl:apply-templates select="@*|node()"/></xsl:copy>
  </xsl:template>
  <xsl:template match="method">
    <xsl:copy>
      <xsl:apply-templates select="@*|node()"/>
      <annotation name="org.freedesktop.DBus.Method.Async" value="server"/>
    </xsl:copy>
  </xsl:template>
</xsl:stylesheet>
