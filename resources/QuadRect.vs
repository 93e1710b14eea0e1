#version 410 core

in vec2 vertex;   // clip space
in vec2 texCoord; // in pixels, the first row at 0
out vec2 coordinate;

void main()
{
    gl_Position = vec4(vertex, 0.0, 1.0);
    coordinate = texCoord;
}
