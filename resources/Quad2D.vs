#version 410 core

in vec2 vertex;   // clip space
in vec2 texCoord; // 0 to 1, the first row of pixels at 0
out vec2 coordinate;

void main()
{
    gl_Position = vec4(vertex, 0.0, 1.0);
    coordinate = texCoord;
}
